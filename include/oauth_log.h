// Audit log: one row of "oauth_log" per message, the oldest dropped beyond a ceiling.

#pragma once

#include "oauth_db_basic.h"

namespace ZEVOOAUTHSERVER {

// Columns of a row: "timestamp" (Unix seconds of the database's clock at insert), "msg" (single
// quotes doubled), "id".
class [[gnu::visibility("default")]] OAUTHDBLog : public OAUTHDBBasic {
 public:
  // tabName: "oauth_log"
  explicit OAUTHDBLog(const std::string& tabName);

  // Writes a message of any length, then trims the table to the setting "log_max". The result is
  // that of the insert.
  //
  // The trim goes by time and not by row: every message that shares the second of the first one
  // beyond the ceiling goes with it, so that fewer rows than the ceiling may be left.
  int Add(const std::string& msg);

  // Reads into *out the rows whose message contains keyword (every row if it is empty), with
  // option as SQL text for order and paging, for example "ORDER BY id DESC LIMIT 10".
  int Get(const std::string& keyword, const std::string& option, Json::Value* out);

  // Deletes every row; fails (log only) when there was none.
  int Del();
};

}  // namespace ZEVOOAUTHSERVER
