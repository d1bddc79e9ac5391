#include "oauth_clientInfo.h"

#include "oauth_failure.h"
#include "oauth_log.h"
#include "oauth_names.h"
#include "oauth_request.h"
#include "oauth_syslog.h"
#include "redirect_uri.h"

namespace ZEVOOAUTHSERVER {
namespace {

namespace column = names::column;
namespace limit = names::limit;

constexpr char kEnabled[] = "1";
constexpr char kDisabled[] = "0";

Json::Value setEnable(long long id, const char* value) {
  Json::Value request = whereId(id);
  request[names::request::kModified][column::kEnable] = value;
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
  const Fields fields = {quoted(column::kClientId, client_id, limit::kClientId),
                         quoted(column::kClientSecret, client_secret, limit::kClientSecret),
                         quoted(column::kRedirectUri, uri, limit::kRedirectUri),
                         quoted(column::kScope, scope, limit::kScope),
                         quoted(column::kDisplayName, display_name, limit::kDisplayName)};
  if (!DBCheckRowMax(static_cast<unsigned long>(getTableRowMax(names::setting::kClientInfoMax))))
    return OAUTH_REFUSE(kErrTableFull, "ClientInfo Table is full");
  if (!fit(fields) || (enable != kEnabled && enable != kDisabled))
    return OAUTH_REFUSE(kErrBadParameters, "Bad parameters");

  Json::Value record = newRow(fields);
  record[column::kEnable] = enable;
  result[column::kClientId] = client_id;
  result[column::kClientSecret] = client_secret;
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
  const Fields fields = {quoted(column::kRedirectUri, redirect_uri, limit::kRedirectUri),
                         quoted(column::kScope, scope, limit::kScope),
                         quoted(column::kDisplayName, display_name, limit::kDisplayName)};
  if (!fit(fields)) return OAUTH_REFUSE(kErrBadParameters, "Bad parameters");
  Json::Value request = changeOf(id, fields);
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
  const Field field = quoted(column::kClientId, client_id, limit::kClientId);
  if (!fit({field})) return OAUTH_REFUSE(kErrBadParameters, "Bad parameters");
  Json::Value request = where(field);
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
