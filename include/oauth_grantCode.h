/// \file
/// Store of authorization codes (RFC 6749, section 4.1): one row of "oauth_grantCode" each.

#pragma once

#include "oauth_db_basic.h"

#pragma GCC visibility push(default)
namespace ZEVOOAUTHSERVER {

/// Store of authorization codes.
///
/// Columns of a row: "username", "client_id" (encrypted in the file, plain in results), "scope",
/// "code", "expired_time" (Unix seconds, decimal text), "state", "ip", "id".
///
/// Lengths in bytes: username 1 to 256; client_id and code 64; scope and state 1 to 2048;
/// expired_time 1 to 128. ip is empty or an IPv4 or IPv6 address, with or without a zone after "%".
/// Refuse texts with a NUL byte before you call: of a quoted text only the part before it is kept.
/// A code is expired when the current time is greater than its expired_time.
class OAUTHDBGrantCode : public OAUTHDBBasic {
 public:
  /// Opens the database; tabName is "oauth_grantCode".
  explicit OAUTHDBGrantCode(const std::string& tabName);

  /// Issues a new code that lives for the setting "grantcode_expired" in seconds.
  ///
  /// result gets {"code": string}, even if the insert then fails. A full table is kErrTableFull,
  /// which is checked before the arguments; a bad address or length is log only.
  int Add(const std::string& username, const std::string& client_id, const std::string& scope,
          const std::string& state, const std::string& ip, Json::Value& result);
  /// The same with the caller's code and expiry.
  int Add(const std::string& username, const std::string& client_id, const std::string& scope,
          const std::string& code, const std::string& expired_time, const std::string& state,
          const std::string& ip, Json::Value& result);

  /// Rewrites the columns of the arguments; a bad length is log only. A single quote is stored as
  /// it is.
  int Edit(long long id, const std::string& username, const std::string& client_id,
           const std::string& scope, const std::string& state);
  /// The same with the expiry. Except in the expiry, a single quote is stored doubled, as by Add().
  int Edit(long long id, const std::string& username, const std::string& client_id,
           const std::string& scope, const std::string& expired_time, const std::string& state);

  /// Spends the code: if several processes try, exactly one succeeds. The id may then be given to a
  /// new row, so find and delete in one transaction, as docs/operations.md shows.
  int Del(long long id);

  /// Reads the row of the code (64 bytes, else kErrBadParameters) into *out. An expired code is
  /// found like any other.
  int Get(const std::string& code, Json::Value* out);
  /// Reads the row of the row id.
  int Get(long long id, Json::Value* out);
  /// Reads every row.
  int Get(Json::Value* out);

  /// Returns the low 32 bits of the code's row id; 0 for an unknown code or a failed look-up.
  int GetIndex(const std::string& code);

  /// Sets the expiry to now; the code counts as expired from the next second on. This claims
  /// nothing: if several processes try, all succeed.
  int Revoke(long long id);

  /// Deletes every expired code, in one transaction. If the disk has no room for that, it commits
  /// row by row, and the error of the first attempt stays. Inside a transaction of the caller it
  /// becomes part of that transaction, and fails if SQLite ends it. Returns 0 only if a row could
  /// not be deleted. A failed read deletes nothing and counts as a success, but leaves its error.
  int Purge();
};

}  // namespace ZEVOOAUTHSERVER
#pragma GCC visibility pop
