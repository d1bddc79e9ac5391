// Names shared by every file of the library. They are stored in existing databases and settings
// files or compared by callers: add freely, never change a value.

#pragma once

namespace ZEVOOAUTHSERVER::names {

namespace table {
inline constexpr char kMeta[] = "oauth_meta";
inline constexpr char kClientInfo[] = "oauth_clientInfo";
inline constexpr char kGrantCode[] = "oauth_grantCode";
inline constexpr char kToken[] = "oauth_token";
inline constexpr char kLog[] = "oauth_log";
}  // namespace table

// Schema versions; the log and the meta table have none.
namespace version {
inline constexpr char kClientInfo[] = "2";
inline constexpr char kGrantCode[] = "2";
inline constexpr char kToken[] = "2";
}  // namespace version

namespace column {
inline constexpr char kEnable[] = "enable";               // "1" or "0"
inline constexpr char kClientId[] = "client_id";          // encrypted at rest
inline constexpr char kClientSecret[] = "client_secret";  // encrypted at rest
inline constexpr char kRedirectUri[] = "redirect_uri";
inline constexpr char kScope[] = "scope";
inline constexpr char kDisplayName[] = "display_name";
inline constexpr char kCode[] = "code";
inline constexpr char kRefreshToken[] = "refresh_token";
inline constexpr char kAccessToken[] = "access_token";
inline constexpr char kExpiredTime[] = "expired_time";  // Unix seconds, decimal text
inline constexpr char kState[] = "state";
inline constexpr char kFlowType[] = "flow_type";
inline constexpr char kUserName[] = "username";
inline constexpr char kId[] = "id";
inline constexpr char kIp[] = "ip";
inline constexpr char kTimestamp[] = "timestamp";  // Unix seconds, integer
inline constexpr char kMsg[] = "msg";
}  // namespace column

// The columns that are encrypted at rest, in every table that has them.
inline constexpr const char* kEncryptedColumns[] = {column::kClientId, column::kClientSecret};

// Lengths of values in bytes, both inclusive.
struct Limit {
  int min, max;
};
namespace limit {
inline constexpr Limit kUserName{1, 256};
inline constexpr Limit kClientId{64, 64};
inline constexpr Limit kClientSecret{64, 64};
inline constexpr Limit kRedirectUri{3, 2048};
inline constexpr Limit kScope{1, 2048};
inline constexpr Limit kDisplayName{1, 64};
inline constexpr Limit kCode{64, 64};
inline constexpr Limit kToken{64, 64};
inline constexpr Limit kExpiredTime{1, 128};
inline constexpr Limit kFlowType{1, 32};
inline constexpr Limit kState{1, 2048};
}  // namespace limit

// Keys of a request document.
namespace request {
inline constexpr char kModified[] = "modified";
inline constexpr char kCondition[] = "condition";
inline constexpr char kOption[] = "option";
inline constexpr char kConditionLike[] = "condition_like";
}  // namespace request

// Keys of a result document.
namespace result {
inline constexpr char kErrMsg[] = "err_msg";
inline constexpr char kErrCode[] = "err_code";
inline constexpr char kExist[] = "exist";
}  // namespace result

// oauth_settings.h says what each one bounds, its default and its range.
namespace setting {
inline constexpr char kGrantCodeExpired[] = "grantcode_expired";
inline constexpr char kTokenExpired[] = "token_expired";
inline constexpr char kClientInfoMax[] = "client_info_max";
inline constexpr char kGrantCodeMax[] = "grantcode_max";
inline constexpr char kTokenMax[] = "token_max";
inline constexpr char kLogMax[] = "log_max";
inline constexpr char kLogLevel[] = "log_level";
}  // namespace setting

namespace path {
inline constexpr char kFolder[] = "/var/packages/Keyloft/target/etc";
inline constexpr char kDatabase[] = "/var/packages/Keyloft/target/etc/oauth.db";
inline constexpr char kSettings[] = "/var/packages/Keyloft/target/etc/oauth.cfg";
inline constexpr char kDebugMarker[] = "/tmp/zevooauth_debug";
}  // namespace path

// Words of the server's programs, kept here so that a value has one home; no store reads them.
namespace word {
inline constexpr char kClient[] = "client";
inline constexpr char kClientType[] = "client";
inline constexpr char kToken[] = "token";
inline constexpr char kLog[] = "log";
inline constexpr char kTotal[] = "total";
inline constexpr char kOffset[] = "offset";
inline constexpr char kLimit[] = "limit";
inline constexpr char kSubstr[] = "substr";
inline constexpr char kRemoteAddr[] = "REMOTE_ADDR";
}  // namespace word

// SQLite keeps these texts in the file as they stand, so they must equal those of existing
// installations byte for byte: no blank after the table's name, doubled blanks in the token table.
namespace schema {
inline constexpr char kMeta[] =
    "CREATE TABLE IF NOT EXISTS oauth_meta"
    "(tab_name text NOT NULL, version integer NOT NULL);";
inline constexpr char kClientInfo[] =
    "CREATE TABLE IF NOT EXISTS oauth_clientInfo"
    "(enable text NOT NULL, client_id text NOT NULL UNIQUE, client_secret text NOT NULL, "
    "redirect_uri text NOT NULL, scope text NOT NULL, display_name text NOT NULL, "
    "id integer PRIMARY KEY);";
inline constexpr char kToken[] =
    "CREATE TABLE IF NOT EXISTS oauth_token"
    "(username text NOT NULL,  client_id text NOT NULL,  scope text NOT NULL,  "
    "refresh_token text NOT NULL, access_token text NOT NULL UNIQUE, "
    "expired_time text NOT NULL, flow_type text NOT NULL, state text NOT NULL, "
    "ip text NOT NULL DEFAULT 'None', id integer PRIMARY KEY);";
inline constexpr char kGrantCode[] =
    "CREATE TABLE IF NOT EXISTS oauth_grantCode"
    "(username text NOT NULL, client_id text NOT NULL, scope text NOT NULL, "
    "code text NOT NULL UNIQUE, expired_time text NOT NULL, state text NOT NULL, "
    "ip text NOT NULL DEFAULT 'None', id integer PRIMARY KEY);";
inline constexpr char kLog[] =
    "CREATE TABLE IF NOT EXISTS oauth_log"
    "(timestamp integer NOT NULL, msg text NOT NULL, id integer PRIMARY KEY);";
}  // namespace schema

}  // namespace ZEVOOAUTHSERVER::names
