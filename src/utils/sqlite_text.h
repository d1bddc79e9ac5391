// Texts that SQLite allocates.

#pragma once

#include <sqlite3.h>

#include <memory>

namespace ZEVOOAUTHSERVER {

struct SqliteFree {
  void operator()(char* text) const { sqlite3_free(text); }
};
using SqliteText = std::unique_ptr<char, SqliteFree>;

}  // namespace ZEVOOAUTHSERVER
