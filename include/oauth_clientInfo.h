/// \file
/// Store of registered client applications: one row of "oauth_clientInfo" each.

#pragma once

#include "oauth_db_basic.h"

#pragma GCC visibility push(default)
namespace ZEVOOAUTHSERVER {

/// Store of registered client applications.
///
/// Columns of a row: "enable" ("1" or "0"), "client_id", "client_secret", "redirect_uri", "scope",
/// "display_name", "id". Identifier and secret are encrypted in the file and plain in results.
///
/// Lengths in bytes: client_id and client_secret 64; redirect_uri 3 to 2048; scope 1 to 2048;
/// display_name 1 to 64. Any other length is kErrBadParameters. Refuse texts with a NUL byte before
/// you call: the store keeps only the part before it.
class OAUTHDBClientInfo : public OAUTHDBBasic {
 public:
  /// Opens the database; tabName is "oauth_clientInfo".
  explicit OAUTHDBClientInfo(const std::string& tabName);

  /// Registers a client and, on success, writes a line to the audit log.
  ///
  /// A leading "https://" or "http://" is removed from redirect_uri before it is checked and
  /// stored. enable is "1" or "0". result gets {"client_id": string, "client_secret": string},
  /// even if the insert then fails. A full table is kErrTableFull, which is checked before the
  /// arguments.
  int Add(const std::string& client_id, const std::string& client_secret,
          const std::string& redirect_uri, const std::string& scope,
          const std::string& display_name, const std::string& enable, Json::Value& result);
  /// The same for an enabled client; identifier and secret are generated.
  int Add(const std::string& redirect_uri, const std::string& scope,
          const std::string& display_name, Json::Value& result);
  /// The same for an enabled client with the caller's secret; only the identifier is generated.
  int Add(const std::string& client_secret, const std::string& redirect_uri,
          const std::string& scope, const std::string& display_name, Json::Value& result);

  /// Rewrites three columns. Unlike Add() it stores redirect_uri whole, scheme included.
  int Edit(long long id, const std::string& redirect_uri, const std::string& scope,
           const std::string& display_name);
  /// Sets "enable" to "1".
  int Enable(long long id);
  /// Sets "enable" to "0".
  int Disable(long long id);

  /// Deletes the client; its codes and tokens stay.
  int Del(long long id);

  /// Reads the row of the identifier into *out.
  int Get(const std::string& client_id, Json::Value* out);
  /// Reads the row of the row id.
  int Get(long long id, Json::Value* out);
  /// Reads every row.
  int Get(Json::Value* out);

  /// Returns the low 32 bits of the client's row id; 0 for an unknown client or a failed look-up.
  int GetIndex(const std::string& client_id);
};

}  // namespace ZEVOOAUTHSERVER
#pragma GCC visibility pop
