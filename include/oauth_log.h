/// \file
/// Audit log: one row of "oauth_log" per message, the oldest dropped beyond a ceiling.

#pragma once

#include "oauth_db_basic.h"

#pragma GCC visibility push(default)
namespace ZEVOOAUTHSERVER {

/// The audit log.
///
/// Columns of a row: "timestamp" (Unix seconds of the database's clock at insert), "msg" (single
/// quotes doubled), "id".
class OAUTHDBLog : public OAUTHDBBasic {
 public:
  /// Opens the database; tabName is "oauth_log".
  explicit OAUTHDBLog(const std::string& tabName);

  /// Writes a message of any length, up to its first NUL byte, then trims the table to the setting
  /// "log_max". The result is that of the insert; a trim that failed leaves its error all the same.
  ///
  /// The trim goes by time and not by row: every message that shares the second of the first one
  /// beyond the ceiling goes with it, so that fewer rows than the ceiling may be left.
  int Add(const std::string& msg);

  /// Reads into *out the rows whose message contains keyword (every row if it is empty), with
  /// option as SQL text for order and paging, for example "ORDER BY id DESC LIMIT 10". In keyword %
  /// and _ are wildcards, case of ASCII letters does not matter, and a single quote must be given
  /// doubled, as it is stored. An option may hold no text in quotes.
  int Get(const std::string& keyword, const std::string& option, Json::Value* out);

  /// Deletes every row; fails when there was none.
  int Del();
};

}  // namespace ZEVOOAUTHSERVER
#pragma GCC visibility pop
