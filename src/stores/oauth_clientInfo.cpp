#include "oauth_clientInfo.h"

#include "oauth_log.h"
#include "oauth_names.h"
#include "oauth_request.h"
#include "oauth_syslog.h"

namespace ZEVOOAUTHSERVER {
namespace {

constexpr char kEnabled[] = "1";
constexpr char kDisabled[] = "0";

int badParameters(OAUTHDBClientInfo& store) {
  store.SetErrCode(kErrBadParameters);
  store.SetErrMsg("Bad parameters");
  OAUTH_FAIL("Bad parameters");
  return 0;
}

std::string withoutScheme(const std::string& uri) {
  for (const std::string scheme : {"https://", "http://"})
    if (uri.compare(0, scheme.size(), scheme) == 0) return uri.substr(scheme.size());
  return uri;
}

Json::Value setEnable(long long id, const char* value) {
  Json::Value request = whereId(id);
  request[names::request::kModified][names::column::kEnable] = value;
  return request;
}

}  // namespace

OAUTHDBClientInfo::OAUTHDBClientInfo(const std::string& tabName) { SetTabName(tabName); }

int OAUTHDBClientInfo::Add(const std::string& client_id, const std::string& client_secret,
                           const std::string& redirect_uri, const std::string& scope,
                           const std::string& display_name, const std::string& enable,
                           Json::Value& result) {
  OAUTH_ENTER();
  OAUTHDBLog auditLog(names::table::kLog);
  const std::string uri = withoutScheme(redirect_uri);
  if (!DBCheckRowMax(static_cast<unsigned long>(getTableRowMax(names::setting::kClientInfoMax)))) {
    SetErrCode(kErrTableFull);
    SetErrMsg("ClientInfo Table is full");
    OAUTH_FAIL("ClientInfo Table is full");
    return 0;
  }
  if (!fit({{client_id, kClientIdLimit},
            {client_secret, kClientSecretLimit},
            {uri, kRedirectUriLimit},
            {scope, kScopeLimit},
            {display_name, kDisplayNameLimit}}) ||
      (enable != kEnabled && enable != kDisabled))
    return badParameters(*this);

  Json::Value record;
  record[names::column::kEnable] = enable;
  record[names::column::kClientId] = getSQLFormatStr(client_id);
  record[names::column::kClientSecret] = getSQLFormatStr(client_secret);
  record[names::column::kRedirectUri] = getSQLFormatStr(uri);
  record[names::column::kScope] = getSQLFormatStr(scope);
  record[names::column::kDisplayName] = getSQLFormatStr(display_name);
  record[names::column::kId] = Json::nullValue;
  result[names::column::kClientId] = client_id;
  result[names::column::kClientSecret] = client_secret;
  if (!DBAdd(record)) return 0;
  auditLog.Add("Application registed[" + display_name + "]");  // spelt as in existing logs
  return 1;
}

int OAUTHDBClientInfo::Add(const std::string& redirect_uri, const std::string& scope,
                           const std::string& display_name, Json::Value& result) {
  const std::string client_id = getRandomStr(64);
  const std::string client_secret = getRandomStr(64);
  return Add(client_id, client_secret, redirect_uri, scope, display_name, kEnabled, result);
}

int OAUTHDBClientInfo::Add(const std::string& client_secret, const std::string& redirect_uri,
                           const std::string& scope, const std::string& display_name,
                           Json::Value& result) {
  return Add(getRandomStr(64), client_secret, redirect_uri, scope, display_name, kEnabled, result);
}

int OAUTHDBClientInfo::Edit(long long id, const std::string& redirect_uri, const std::string& scope,
                            const std::string& display_name) {
  OAUTH_ENTER();
  if (!fit({{redirect_uri, kRedirectUriLimit},
            {scope, kScopeLimit},
            {display_name, kDisplayNameLimit}}))
    return badParameters(*this);
  Json::Value request = whereId(id);
  Json::Value& modified = request[names::request::kModified];
  modified[names::column::kRedirectUri] = getSQLFormatStr(redirect_uri);
  modified[names::column::kScope] = getSQLFormatStr(scope);
  modified[names::column::kDisplayName] = getSQLFormatStr(display_name);
  return DBEdit(request);
}

int OAUTHDBClientInfo::Enable(long long id) {
  OAUTH_ENTER();
  Json::Value request = setEnable(id, kEnabled);
  return DBEdit(request);
}

int OAUTHDBClientInfo::Disable(long long id) {
  OAUTH_ENTER();
  Json::Value request = setEnable(id, kDisabled);
  return DBEdit(request);
}

int OAUTHDBClientInfo::Del(long long id) {
  OAUTH_ENTER();
  Json::Value request = whereId(id);
  return DBDel(request);
}

int OAUTHDBClientInfo::Get(const std::string& client_id, Json::Value* out) {
  OAUTH_ENTER();
  if (!fit({{client_id, kClientIdLimit}})) return badParameters(*this);
  Json::Value request = where(names::column::kClientId, getSQLFormatStr(client_id));
  return DBGet(request, out);
}

int OAUTHDBClientInfo::Get(long long id, Json::Value* out) {
  OAUTH_ENTER();
  Json::Value request = whereId(id);
  return DBGet(request, out);
}

int OAUTHDBClientInfo::Get(Json::Value* out) {
  OAUTH_ENTER();
  Json::Value request;
  return DBGet(request, out);
}

int OAUTHDBClientInfo::GetIndex(const std::string& client_id) {
  OAUTH_ENTER();
  Json::Value rows(Json::arrayValue);
  return Get(client_id, &rows) ? firstId(rows) : 0;
}

}  // namespace ZEVOOAUTHSERVER
