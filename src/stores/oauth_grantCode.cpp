#include "oauth_grantCode.h"

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
  const Fields fields = {quoted(column::kUserName, username, limit::kUserName),
                         quoted(column::kClientId, client_id, limit::kClientId),
                         quoted(column::kScope, scope, limit::kScope),
                         quoted(column::kCode, code, limit::kCode),
                         asGiven(column::kExpiredTime, expired_time, limit::kExpiredTime),
                         quoted(column::kState, state, limit::kState)};
  const std::string badAddress = addressError(ip);
  if (!DBCheckRowMax(static_cast<unsigned long>(getTableRowMax(names::setting::kGrantCodeMax))))
    return OAUTH_REFUSE(kErrTableFull, "GrantCode Table is full");
  if (!badAddress.empty()) {
    OAUTH_FAIL("Bad IP address[%s]", badAddress.c_str());
    return 0;
  }
  if (!fit(fields)) return badParameters();

  Json::Value record = newRow(fields);
  record[column::kIp] = ip;  // as given, unlike a token's
  result[column::kCode] = code;
  return DBAdd(record);
}

// No entry trace, and values as given, unlike the form with expired_time.
int OAUTHDBGrantCode::Edit(long long id, const std::string& username, const std::string& client_id,
                           const std::string& scope, const std::string& state) {
  const Fields fields = {asGiven(column::kUserName, username, limit::kUserName),
                         asGiven(column::kClientId, client_id, limit::kClientId),
                         asGiven(column::kScope, scope, limit::kScope),
                         asGiven(column::kState, state, limit::kState)};
  if (!fit(fields)) return badParameters();
  Json::Value request = changeOf(id, fields);
  return DBEdit(request);
}

int OAUTHDBGrantCode::Edit(long long id, const std::string& username, const std::string& client_id,
                           const std::string& scope, const std::string& expired_time,
                           const std::string& state) {
  OAUTH_ENTER();
  const Fields fields = {quoted(column::kUserName, username, limit::kUserName),
                         quoted(column::kClientId, client_id, limit::kClientId),
                         quoted(column::kScope, scope, limit::kScope),
                         asGiven(column::kExpiredTime, expired_time, limit::kExpiredTime),
                         quoted(column::kState, state, limit::kState)};
  if (!fit(fields)) return badParameters();
  Json::Value request = changeOf(id, fields);
  return DBEdit(request);
}

int OAUTHDBGrantCode::Del(long long id) {
  OAUTH_ENTER();
  Json::Value request = whereId(id);
  return DBDel(request);
}

int OAUTHDBGrantCode::Get(const std::string& code, Json::Value* out) {
  OAUTH_ENTER();
  const Field field = asGiven(column::kCode, code, limit::kCode);  // unlike other look-ups
  if (!fit({field})) return OAUTH_REFUSE(kErrBadParameters, "Bad parameters");
  Json::Value request = where(field);
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
  request[names::request::kModified][column::kExpiredTime] = std::to_string(unixNow());
  return DBEdit(request);
}

int OAUTHDBGrantCode::Purge() {
  OAUTH_ENTER();
  return purgeExpired(*this);
}

}  // namespace ZEVOOAUTHSERVER
