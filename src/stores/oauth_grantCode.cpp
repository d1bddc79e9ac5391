#include "oauth_grantCode.h"

#include <boost/asio/ip/address.hpp>

#include "oauth_expiry.h"
#include "oauth_names.h"
#include "oauth_request.h"
#include "oauth_syslog.h"

namespace ZEVOOAUTHSERVER {
namespace {

// Log only, unlike the other stores: the error state stays as it was.
int badParameters() {
  OAUTH_FAIL("Bad parameters");
  return 0;
}

}  // namespace

OAUTHDBGrantCode::OAUTHDBGrantCode(const std::string& tabName) { SetTabName(tabName); }

int OAUTHDBGrantCode::Add(const std::string& username, const std::string& client_id,
                          const std::string& scope, const std::string& state, const std::string& ip,
                          Json::Value& result) {
  const std::int64_t expiry = unixNow() + getExpiredPeriod(names::setting::kGrantCodeExpired);
  return Add(username, client_id, scope, getRandomStr(64), std::to_string(expiry), state, ip,
             result);
}

int OAUTHDBGrantCode::Add(const std::string& username, const std::string& client_id,
                          const std::string& scope, const std::string& code,
                          const std::string& expired_time, const std::string& state,
                          const std::string& ip, Json::Value& result) {
  OAUTH_ENTER();
  boost::system::error_code ipError;
  boost::asio::ip::make_address(ip, ipError);
  if (!DBCheckRowMax(static_cast<unsigned long>(getTableRowMax(names::setting::kGrantCodeMax)))) {
    SetErrCode(kErrTableFull);
    SetErrMsg("GrantCode Table is full");
    OAUTH_FAIL("GrantCode Table is full");
    return 0;
  }
  if (!ip.empty() && ipError) {
    OAUTH_FAIL("Bad IP address[%s]", ipError.message().c_str());
    return 0;
  }
  if (!fit({{username, kUserNameLimit},
            {client_id, kClientIdLimit},
            {scope, kScopeLimit},
            {code, kCodeLimit},
            {expired_time, kExpiredTimeLimit},
            {state, kStateLimit}}))
    return badParameters();

  Json::Value record;
  record[names::column::kUserName] = getSQLFormatStr(username);
  record[names::column::kClientId] = getSQLFormatStr(client_id);
  record[names::column::kScope] = getSQLFormatStr(scope);
  record[names::column::kCode] = getSQLFormatStr(code);
  record[names::column::kExpiredTime] = expired_time;  // as given, unlike a token's
  record[names::column::kState] = getSQLFormatStr(state);
  record[names::column::kId] = Json::nullValue;
  record[names::column::kIp] = ip;  // as given, unlike a token's
  result[names::column::kCode] = code;
  return DBAdd(record);
}

// Values as given, none quoted, and no entry trace: unlike the form with expired_time.
int OAUTHDBGrantCode::Edit(long long id, const std::string& username, const std::string& client_id,
                           const std::string& scope, const std::string& state) {
  if (!fit({{username, kUserNameLimit},
            {client_id, kClientIdLimit},
            {scope, kScopeLimit},
            {state, kStateLimit}}))
    return badParameters();
  Json::Value request = whereId(id);
  Json::Value& modified = request[names::request::kModified];
  modified[names::column::kUserName] = username;
  modified[names::column::kClientId] = client_id;
  modified[names::column::kScope] = scope;
  modified[names::column::kState] = state;
  return DBEdit(request);
}

int OAUTHDBGrantCode::Edit(long long id, const std::string& username, const std::string& client_id,
                           const std::string& scope, const std::string& expired_time,
                           const std::string& state) {
  OAUTH_ENTER();
  if (!fit({{username, kUserNameLimit},
            {client_id, kClientIdLimit},
            {scope, kScopeLimit},
            {expired_time, kExpiredTimeLimit},
            {state, kStateLimit}}))
    return badParameters();
  Json::Value request = whereId(id);
  Json::Value& modified = request[names::request::kModified];
  modified[names::column::kUserName] = getSQLFormatStr(username);
  modified[names::column::kClientId] = getSQLFormatStr(client_id);
  modified[names::column::kScope] = getSQLFormatStr(scope);
  modified[names::column::kState] = getSQLFormatStr(state);
  modified[names::column::kExpiredTime] = expired_time;
  return DBEdit(request);
}

int OAUTHDBGrantCode::Del(long long id) {
  OAUTH_ENTER();
  Json::Value request = whereId(id);
  return DBDel(request);
}

int OAUTHDBGrantCode::Get(const std::string& code, Json::Value* out) {
  OAUTH_ENTER();
  if (!fit({{code, kCodeLimit}})) {
    SetErrCode(kErrBadParameters);
    SetErrMsg("Bad parameters");
    return badParameters();
  }
  Json::Value request = where(names::column::kCode, code);  // as given, unlike other look-ups
  return DBGet(request, out);
}

int OAUTHDBGrantCode::Get(long long id, Json::Value* out) {
  OAUTH_ENTER();
  Json::Value request = whereId(id);
  return DBGet(request, out);
}

int OAUTHDBGrantCode::Get(Json::Value* out) {
  OAUTH_ENTER();
  Json::Value request;
  return DBGet(request, out);
}

int OAUTHDBGrantCode::GetIndex(const std::string& code) {
  OAUTH_ENTER();
  Json::Value rows(Json::arrayValue);
  return Get(code, &rows) ? firstId(rows) : 0;
}

int OAUTHDBGrantCode::Revoke(long long id) {
  OAUTH_ENTER();
  Json::Value request = whereId(id);
  request[names::request::kModified][names::column::kExpiredTime] = std::to_string(unixNow());
  return DBEdit(request);
}

int OAUTHDBGrantCode::Purge() {
  OAUTH_ENTER();
  return purgeExpired(*this);
}

}  // namespace ZEVOOAUTHSERVER
