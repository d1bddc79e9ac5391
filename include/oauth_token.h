/// \file
/// Store of issued tokens (RFC 6749): one row of "oauth_token" per grant, with its access token
/// and its refresh token.

#pragma once

#include "oauth_db_basic.h"

#pragma GCC visibility push(default)
namespace ZEVOOAUTHSERVER {

/// Store of issued access tokens and their refresh tokens.
///
/// Columns of a row: "username", "client_id" (encrypted in the file, plain in results), "scope",
/// "refresh_token", "access_token", "expired_time" (Unix seconds, decimal text), "flow_type",
/// "state", "ip", "id".
///
/// Lengths in bytes: username 1 to 256; client_id, refresh_token and access_token 64; scope and
/// state 1 to 2048; expired_time 1 to 128; flow_type 1 to 32. Any other length is
/// kErrBadParameters. ip is empty or an IPv4 or IPv6 address, with or without a zone after "%".
/// Refuse texts with a NUL byte before you call: of a quoted text only the part before it is kept.
///
/// The access token is expired when the current time is greater than expired_time. The refresh
/// token has no expiry of its own; it is deleted with the row.
class OAUTHDBToken : public OAUTHDBBasic {
 public:
  /// Opens the database; tabName is "oauth_token".
  explicit OAUTHDBToken(const std::string& tabName);

  /// Stores a grant with the caller's tokens and expiry.
  ///
  /// result gets {"access_token": string, "refresh_token": string}, even if the insert then fails.
  /// The checks have this order: a full table is kErrTableFull, a bad address is log only, a bad
  /// length is kErrBadParameters.
  int Add(const std::string& username, const std::string& client_id, const std::string& scope,
          const std::string& refresh_token, const std::string& access_token,
          const std::string& expired_time, const std::string& flow_type, const std::string& state,
          const std::string& ip, Json::Value& result);
  /// Issues new tokens that live for the setting "token_expired" in seconds; otherwise the same.
  int Add(const std::string& username, const std::string& client_id, const std::string& scope,
          const std::string& flow_type, const std::string& state, const std::string& ip,
          Json::Value& result);

  /// Rewrites the columns of the arguments; tokens and ip never change. A single quote is stored as
  /// it is.
  int Edit(long long id, const std::string& username, const std::string& client_id,
           const std::string& scope, const std::string& flow_type, const std::string& state);
  /// The same with the expiry. Except in the expiry, a single quote is stored doubled, as by Add().
  int Edit(long long id, const std::string& username, const std::string& client_id,
           const std::string& scope, const std::string& expired_time, const std::string& flow_type,
           const std::string& state);

  /// Deletes the row, access token and refresh token together. If several processes try, exactly
  /// one succeeds, and may issue the new tokens of a refresh. The id may then be given to a new
  /// row, so find and delete in one transaction, as docs/operations.md shows.
  int Del(long long id);
  /// The same as Del().
  int Revoke(long long id);

  /// Reads the row of the access token into *out. An expired one is found like any other.
  int GetWithAccessToken(const std::string& access_token, Json::Value* out);
  /// Reads the rows of the refresh token, even if the access token has expired.
  int GetWithRefreshToken(const std::string& refresh_token, Json::Value* out);
  /// Reads the row of the row id.
  int Get(long long id, Json::Value* out);
  /// Reads every row.
  int Get(Json::Value* out);

  /// Returns the low 32 bits of the token's row id; 0 for an unknown token or a failed look-up.
  int GetIndex(const std::string& access_token);

  /// Deletes every row whose access token has expired, refresh token included, in one transaction.
  /// If the disk has no room for that, it commits row by row, and the error of the first attempt
  /// stays. Inside a transaction of the caller it becomes part of that transaction, and fails if
  /// SQLite ends it. Returns 0 only if a row could not be deleted. A failed read deletes nothing
  /// and counts as a success, but leaves its error.
  int Purge();

  /// Checks a presented access token against the clock.
  ///
  /// - Valid: returns 1, and result gets {"username": string, "scope": string, "state": string}.
  /// - Else: returns 0, and result gets {"err_code": int, "err_msg": string}. An unknown token is
  ///   reported as expired (kErrTokenExpired). The store's own error is set only if the look-up
  ///   failed.
  ///
  /// A token is still valid during the very second that expired_time names.
  int Verify(const std::string& access_token, Json::Value& result);
};

}  // namespace ZEVOOAUTHSERVER
#pragma GCC visibility pop
