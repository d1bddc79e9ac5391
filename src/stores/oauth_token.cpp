#include "oauth_token.h"

#include <boost/asio/ip/address.hpp>

#include "oauth_expiry.h"
#include "oauth_names.h"
#include "oauth_request.h"
#include "oauth_syslog.h"

namespace ZEVOOAUTHSERVER {
namespace {

int badParameters(OAUTHDBToken& store) {
  store.SetErrCode(kErrBadParameters);
  store.SetErrMsg("Bad parameters");
  OAUTH_FAIL("Bad parameters");
  return 0;
}

}  // namespace

OAUTHDBToken::OAUTHDBToken(const std::string& tabName) { SetTabName(tabName); }

int OAUTHDBToken::Add(const std::string& username, const std::string& client_id,
                      const std::string& scope, const std::string& refresh_token,
                      const std::string& access_token, const std::string& expired_time,
                      const std::string& flow_type, const std::string& state, const std::string& ip,
                      Json::Value& result) {
  OAUTH_ENTER();
  boost::system::error_code ipError;
  boost::asio::ip::make_address(ip, ipError);
  if (!DBCheckRowMax(static_cast<unsigned long>(getTableRowMax(names::setting::kTokenMax)))) {
    SetErrCode(kErrTableFull);
    SetErrMsg("Token Table is full");
    OAUTH_FAIL("Token Table is full");
    return 0;
  }
  if (!ip.empty() && ipError) {
    OAUTH_FAIL("Bad IP address[%s]", ipError.message().c_str());
    return 0;
  }
  if (!fit({{username, kUserNameLimit},
            {client_id, kClientIdLimit},
            {scope, kScopeLimit},
            {refresh_token, kTokenLimit},
            {access_token, kTokenLimit},
            {expired_time, kExpiredTimeLimit},
            {flow_type, kFlowTypeLimit},
            {state, kStateLimit}}))
    return badParameters(*this);

  Json::Value record;
  record[names::column::kUserName] = getSQLFormatStr(username);
  record[names::column::kClientId] = getSQLFormatStr(client_id);
  record[names::column::kScope] = getSQLFormatStr(scope);
  record[names::column::kRefreshToken] = getSQLFormatStr(refresh_token);
  record[names::column::kAccessToken] = getSQLFormatStr(access_token);
  record[names::column::kExpiredTime] = getSQLFormatStr(expired_time);
  record[names::column::kFlowType] = getSQLFormatStr(flow_type);
  record[names::column::kState] = getSQLFormatStr(state);
  record[names::column::kId] = Json::nullValue;
  record[names::column::kIp] = getSQLFormatStr(ip);
  result[names::column::kRefreshToken] = refresh_token;
  result[names::column::kAccessToken] = access_token;
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

// Values as given, none quoted: unlike the form with expired_time.
int OAUTHDBToken::Edit(long long id, const std::string& username, const std::string& client_id,
                       const std::string& scope, const std::string& flow_type,
                       const std::string& state) {
  OAUTH_ENTER();
  if (!fit({{username, kUserNameLimit},
            {client_id, kClientIdLimit},
            {scope, kScopeLimit},
            {flow_type, kFlowTypeLimit},
            {state, kStateLimit}}))
    return badParameters(*this);
  Json::Value request = whereId(id);
  Json::Value& modified = request[names::request::kModified];
  modified[names::column::kClientId] = client_id;
  modified[names::column::kScope] = scope;
  modified[names::column::kState] = state;
  modified[names::column::kUserName] = username;
  modified[names::column::kFlowType] = flow_type;
  return DBEdit(request);
}

int OAUTHDBToken::Edit(long long id, const std::string& username, const std::string& client_id,
                       const std::string& scope, const std::string& expired_time,
                       const std::string& flow_type, const std::string& state) {
  OAUTH_ENTER();
  if (!fit({{username, kUserNameLimit},
            {client_id, kClientIdLimit},
            {scope, kScopeLimit},
            {expired_time, kExpiredTimeLimit},
            {flow_type, kFlowTypeLimit},
            {state, kStateLimit}}))
    return badParameters(*this);
  Json::Value request = whereId(id);
  Json::Value& modified = request[names::request::kModified];
  modified[names::column::kClientId] = getSQLFormatStr(client_id);
  modified[names::column::kScope] = getSQLFormatStr(scope);
  modified[names::column::kState] = getSQLFormatStr(state);
  modified[names::column::kUserName] = getSQLFormatStr(username);
  modified[names::column::kExpiredTime] = expired_time;
  modified[names::column::kFlowType] = getSQLFormatStr(flow_type);
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
  if (!fit({{access_token, kTokenLimit}})) return badParameters(*this);
  Json::Value request = where(names::column::kAccessToken, getSQLFormatStr(access_token));
  return DBGet(request, out);
}

int OAUTHDBToken::GetWithRefreshToken(const std::string& refresh_token, Json::Value* out) {
  OAUTH_ENTER();
  if (!fit({{refresh_token, kTokenLimit}})) return badParameters(*this);
  Json::Value request = where(names::column::kRefreshToken, getSQLFormatStr(refresh_token));
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
  // No row reads as null and null as 0, so that an unknown token is reported as expired.
  const Json::Value& row = std::as_const(rows)[0U];
  if (isExpired(row, now)) {
    result[names::result::kErrMsg] = "Access Token Expired";
    result[names::result::kErrCode] = kErrTokenExpired;
    return 0;
  }
  for (const char* const key :
       {names::column::kUserName, names::column::kScope, names::column::kState})
    result[key] = row[key];
  return 1;
}

}  // namespace ZEVOOAUTHSERVER
