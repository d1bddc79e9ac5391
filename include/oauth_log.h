/// \file
/// Audit log: one row of "oauth_log" per message. Beyond a ceiling the oldest rows are deleted.

#pragma once

#include "oauth_db_basic.h"

#pragma GCC visibility push(default)
namespace ZEVOOAUTHSERVER {

/// The audit log.
///
/// Columns of a row: "timestamp" (Unix seconds of SQLite's clock at insert), "msg" (single quotes
/// doubled), "id".
class OAUTHDBLog : public OAUTHDBBasic {
 public:
  /// Opens the database; tabName is "oauth_log".
  explicit OAUTHDBLog(const std::string& tabName);

  /// Writes a message of any length, up to its first NUL byte, then trims the table to the setting
  /// "log_max". The result is that of the insert; a failed trim only leaves its error.
  ///
  /// The trim deletes whole seconds: the first row beyond the ceiling, all older rows, and every
  /// row of the same second. So fewer rows than the ceiling may be left.
  int Add(const std::string& msg);

  /// Reads into *out the rows whose message contains keyword (every row if keyword is empty).
  /// option is SQL text for order and paging, for example "ORDER BY id DESC LIMIT 10"; it must not
  /// contain a text in quotes. In keyword, % and _ are wildcards, the case of ASCII letters does
  /// not matter, and a single quote must be doubled, as it is stored.
  int Get(const std::string& keyword, const std::string& option, Json::Value* out);

  /// Deletes every row; fails if there was none.
  int Del();
};

}  // namespace ZEVOOAUTHSERVER
#pragma GCC visibility pop
