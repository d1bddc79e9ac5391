#include "oauth_token.h"

#include <utility>

#include "ip_address.h"
#include "oauth_expiry.h"
#include "oauth_failure.h"
#include "oauth_names.h"
#include "oauth_request.h"
#include "oauth_syslog.h"

namespace ZEVOOAUTHSERVER {
namespace {

namespace column = names::column;
namespace limit = names::limit;

}  // namespace

OAUTHDBToken::OAUTHDBToken(const std::string& tabName) { SetTabName(tabName); }

int OAUTHDBToken::Add(const std::string& username, const std::string& client_id,
                      const std::string& scope, const std::string& refresh_token,
                      const std::string& access_token, const std::string& expired_time,
                      const std::string& flow_type, const std::string& state, const std::string& ip,
                      Json::Value& result) {
  OAUTH_ENTER();
  const Fields fields = {quoted(column::kUserName, username, limit::kUserName),
                         quoted(column::kClientId, client_id, limit::kClientId),
                         quoted(column::kScope, scope, limit::kScope),
                         quoted(column::kRefreshToken, refresh_token, limit::kToken),
                         quoted(column::kAccessToken, access_token, limit::kToken),
                         quoted(column::kExpiredTime, expired_time, limit::kExpiredTime),
                         quoted(column::kFlowType, flow_type, limit::kFlowType),
                         quoted(column::kState, state, limit::kState)};
  const std::string badAddress = addressError(ip);
  if (!DBCheckRowMax(static_cast<unsigned long>(getTableRowMax(names::setting::kTokenMax))))
    return OAUTH_REFUSE(kErrTableFull, "Token Table is full");
  if (!badAddress.empty()) {
    OAUTH_FAIL("Bad IP address[%s]", badAddress.c_str());
    return 0;
  }
  if (!fit(fields)) return OAUTH_REFUSE(kErrBadParameters, "Bad parameters");

  Json::Value record = newRow(fields);
  record[column::kIp] = getSQLFormatStr(ip);
  result[column::kRefreshToken] = refresh_token;
  result[column::kAccessToken] = access_token;
  return DBAdd(record);
}

int OAUTHDBToken::Add(const std::string& username, const std::string& client_id,
                      const std::string& scope, const std::string& flow_type,
                      const std::string& state, const std::string& ip, Json::Value& result) {
  OAUTH_ENTER();
  const std::int64_t expiry = unixNow() + getExpiredPeriod(names::setting::kTokenExpired);
  const std::string access_token = getRandomStr(64);
  const std::string refresh_token = getRandomStr(64);
  return Add(username, client_id, scope, refresh_token, access_token, std::to_string(expiry),
             flow_type, state, ip, result);
}

// Values as given, unlike the form with expired_time.
int OAUTHDBToken::Edit(long long id, const std::string& username, const std::string& client_id,
                       const std::string& scope, const std::string& flow_type,
                       const std::string& state) {
  OAUTH_ENTER();
  const Fields fields = {asGiven(column::kUserName, username, limit::kUserName),
                         asGiven(column::kClientId, client_id, limit::kClientId),
                         asGiven(column::kScope, scope, limit::kScope),
                         asGiven(column::kFlowType, flow_type, limit::kFlowType),
                         asGiven(column::kState, state, limit::kState)};
  if (!fit(fields)) return OAUTH_REFUSE(kErrBadParameters, "Bad parameters");
  Json::Value request = changeOf(id, fields);
  return DBEdit(request);
}

int OAUTHDBToken::Edit(long long id, const std::string& username, const std::string& client_id,
                       const std::string& scope, const std::string& expired_time,
                       const std::string& flow_type, const std::string& state) {
  OAUTH_ENTER();
  const Fields fields = {quoted(column::kUserName, username, limit::kUserName),
                         quoted(column::kClientId, client_id, limit::kClientId),
                         quoted(column::kScope, scope, limit::kScope),
                         asGiven(column::kExpiredTime, expired_time, limit::kExpiredTime),
                         quoted(column::kFlowType, flow_type, limit::kFlowType),
                         quoted(column::kState, state, limit::kState)};
  if (!fit(fields)) return OAUTH_REFUSE(kErrBadParameters, "Bad parameters");
  Json::Value request = changeOf(id, fields);
  return DBEdit(request);
}

int OAUTHDBToken::Del(long long id) {
  OAUTH_ENTER();
  Json::Value request = whereId(id);
  return DBDel(request);
}

int OAUTHDBToken::Revoke(long long id) {
  OAUTH_ENTER();
  return Del(id);
}

int OAUTHDBToken::GetWithAccessToken(const std::string& access_token, Json::Value* out) {
  OAUTH_ENTER();
  const Field field = quoted(column::kAccessToken, access_token, limit::kToken);
  if (!fit({field})) return OAUTH_REFUSE(kErrBadParameters, "Bad parameters");
  Json::Value request = where(field);
  return DBGet(request, out);
}

int OAUTHDBToken::GetWithRefreshToken(const std::string& refresh_token, Json::Value* out) {
  OAUTH_ENTER();
  const Field field = quoted(column::kRefreshToken, refresh_token, limit::kToken);
  if (!fit({field})) return OAUTH_REFUSE(kErrBadParameters, "Bad parameters");
  Json::Value request = where(field);
  return DBGet(request, out);
}

int OAUTHDBToken::Get(long long id, Json::Value* out) {
  OAUTH_ENTER();
  Json::Value request = whereId(id);
  return DBGet(request, out);
}

int OAUTHDBToken::Get(Json::Value* out) {
  OAUTH_ENTER();
  Json::Value request;
  return DBGet(request, out);
}

int OAUTHDBToken::GetIndex(const std::string& access_token) {
  OAUTH_ENTER();
  Json::Value rows(Json::arrayValue);
  return GetWithAccessToken(access_token, &rows) ? firstId(rows) : 0;
}

int OAUTHDBToken::Purge() {
  OAUTH_ENTER();
  return purgeExpired(*this);
}

int OAUTHDBToken::Verify(const std::string& access_token, Json::Value& result) {
  OAUTH_ENTER();
  const std::int64_t now = unixNow();
  Json::Value rows(Json::arrayValue);
  if (!GetWithAccessToken(access_token, &rows)) {
    result[names::result::kErrMsg] = GetErrMsg();
    result[names::result::kErrCode] = GetErrCode();
    return 0;
  }
  // No row reads as null, and null as 0: an unknown token is reported as expired.
  const Json::Value& row = std::as_const(rows)[0U];
  if (isExpired(row, now)) {
    result[names::result::kErrMsg] = "Access Token Expired";
    result[names::result::kErrCode] = kErrTokenExpired;
    return 0;
  }
  for (const char* const key : {column::kUserName, column::kScope, column::kState})
    result[key] = row[key];
  return 1;
}

}  // namespace ZEVOOAUTHSERVER
