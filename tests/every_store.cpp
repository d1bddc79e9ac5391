#include "every_store.h"

#include <algorithm>

using ZEVOOAUTHSERVER::OAUTHDBBasic;
using ZEVOOAUTHSERVER::OAUTHDBClientInfo;
using ZEVOOAUTHSERVER::OAUTHDBGrantCode;
using ZEVOOAUTHSERVER::OAUTHDBLog;
using ZEVOOAUTHSERVER::OAUTHDBToken;

// --- Forms of Add() and Edit() ---

int add(OAUTHDBClientInfo& clients, const Row& row, Json::Value& result) {
  return clients.Add(row.at("client_id"), row.at("client_secret"), row.at("redirect_uri"),
                     row.at("scope"), row.at("display_name"), row.at("enable"), result);
}
int addGenerated(OAUTHDBClientInfo& clients, const Row& row, Json::Value& result) {
  return clients.Add(row.at("redirect_uri"), row.at("scope"), row.at("display_name"), result);
}
int addWithSecret(OAUTHDBClientInfo& clients, const Row& row, Json::Value& result) {
  return clients.Add(row.at("client_secret"), row.at("redirect_uri"), row.at("scope"),
                     row.at("display_name"), result);
}
int edit(OAUTHDBClientInfo& clients, long long id, const Row& row) {
  return clients.Edit(id, row.at("redirect_uri"), row.at("scope"), row.at("display_name"));
}

int add(OAUTHDBGrantCode& codes, const Row& row, Json::Value& result) {
  return codes.Add(row.at("username"), row.at("client_id"), row.at("scope"), row.at("code"),
                   row.at("expired_time"), row.at("state"), row.at("ip"), result);
}
int issue(OAUTHDBGrantCode& codes, const Row& row, Json::Value& result) {
  return codes.Add(row.at("username"), row.at("client_id"), row.at("scope"), row.at("state"),
                   row.at("ip"), result);
}
int shortEdit(OAUTHDBGrantCode& codes, long long id, const Row& row) {
  return codes.Edit(id, row.at("username"), row.at("client_id"), row.at("scope"), row.at("state"));
}
int longEdit(OAUTHDBGrantCode& codes, long long id, const Row& row) {
  return codes.Edit(id, row.at("username"), row.at("client_id"), row.at("scope"),
                    row.at("expired_time"), row.at("state"));
}

int add(OAUTHDBToken& tokens, const Row& row, Json::Value& result) {
  return tokens.Add(row.at("username"), row.at("client_id"), row.at("scope"),
                    row.at("refresh_token"), row.at("access_token"), row.at("expired_time"),
                    row.at("flow_type"), row.at("state"), row.at("ip"), result);
}
int issue(OAUTHDBToken& tokens, const Row& row, Json::Value& result) {
  return tokens.Add(row.at("username"), row.at("client_id"), row.at("scope"), row.at("flow_type"),
                    row.at("state"), row.at("ip"), result);
}
int shortEdit(OAUTHDBToken& tokens, long long id, const Row& row) {
  return tokens.Edit(id, row.at("username"), row.at("client_id"), row.at("scope"),
                     row.at("flow_type"), row.at("state"));
}
int longEdit(OAUTHDBToken& tokens, long long id, const Row& row) {
  return tokens.Edit(id, row.at("username"), row.at("client_id"), row.at("scope"),
                     row.at("expired_time"), row.at("flow_type"), row.at("state"));
}

// --- Descriptions ---

namespace {

template <class Store>
std::function<std::shared_ptr<OAUTHDBBasic>()> opener(const char* table) {
  return [table] { return std::make_shared<Store>(table); };
}

// An operation of the store as one of the base class. Its first parameter is the store.
template <class Store, class Operation>
auto of(Operation operation) {
  return [operation](OAUTHDBBasic& store, auto&&... arguments) -> int {
    return std::invoke(operation, static_cast<Store&>(store),
                       std::forward<decltype(arguments)>(arguments)...);
  };
}
template <class Store>
Change::Run adding(int (*add)(Store&, const Row&, Json::Value&)) {
  return [add](OAUTHDBBasic& store, long long, const Row& row, Json::Value& result) {
    return add(static_cast<Store&>(store), row, result);
  };
}
template <class Store>
Change::Run editing(int (*edit)(Store&, long long, const Row&)) {
  return [edit](OAUTHDBBasic& store, long long id, const Row& row, Json::Value&) {
    return edit(static_cast<Store&>(store), id, row);
  };
}
template <class Store>
Change::Run switching(int (Store::*change)(long long)) {
  return [change](OAUTHDBBasic& store, long long id, const Row&, Json::Value&) {
    return (static_cast<Store&>(store).*change)(id);
  };
}
template <class Store>
auto getById() {
  return of<Store>(
      [](Store& store, long long id, Json::Value* rows) { return store.Get(id, rows); });
}
template <class Store>
auto getAll() {
  return of<Store>([](Store& store, Json::Value* rows) { return store.Get(rows); });
}
template <class Store>
auto getByText() {
  return of<Store>([](Store& store, const std::string& text, Json::Value* rows) {
    return store.Get(text, rows);
  });
}

const Field kUserName{"username", 1, 256}, kClientId{"client_id", 64, 64},
    kClientSecret{"client_secret", 64, 64}, kRedirectUri{"redirect_uri", 3, 2048},
    kScope{"scope", 1, 2048}, kDisplayName{"display_name", 1, 64}, kCode{"code", 64, 64},
    kRefreshToken{"refresh_token", 64, 64}, kAccessToken{"access_token", 64, 64},
    kExpiredTime{"expired_time", 1, 128}, kFlowType{"flow_type", 1, 32}, kState{"state", 1, 2048},
    kIp{"ip"}, kMsg{"msg"};

std::vector<Field> asGiven(std::vector<Field> fields) {
  for (Field& field : fields) field.asGiven = true;
  return fields;
}
Field asGiven(const Field& field) { return asGiven(std::vector<Field>{field}).front(); }

}  // namespace

const StoreDescription kClients = [] {
  using Store = OAUTHDBClientInfo;
  StoreDescription its;
  its.table = "oauth_clientInfo";
  its.columns = {"enable", "client_id", "client_secret", "redirect_uri", "scope", "display_name"};
  its.row = {{"enable", "1"},
             {"client_id", times(64, 'c')},
             {"client_secret", times(64, 's')},
             {"redirect_uri", "example.com/cb"},
             {"scope", "read"},
             {"display_name", "Mail"}};
  its.other = {{"enable", "0"},
               {"client_id", times(64, 'd')},
               {"client_secret", times(64, 't')},
               {"redirect_uri", "other.example/cb"},
               {"scope", "write"},
               {"display_name", "Calendar"}};
  its.key = "client_id";
  its.secrets = {"client_id", "client_secret"};
  its.ceiling = "client_info_max";
  its.full = "ClientInfo Table is full";
  its.opensTheAuditLog = true;
  its.open = opener<Store>("oauth_clientInfo");
  its.changes = {
      {"full Add()",
       "Add",
       adding<Store>(add),
       {kClientId, kClientSecret, kRedirectUri, kScope, kDisplayName},
       false},
      {"generating Add()",
       "Add",
       adding<Store>(addGenerated),
       {kRedirectUri, kScope, kDisplayName},
       false},
      {"Add() with the secret",
       "Add",
       adding<Store>(addWithSecret),
       {kClientSecret, kRedirectUri, kScope, kDisplayName},
       false},
      {"Edit()", "Edit", editing<Store>(edit), {kRedirectUri, kScope, kDisplayName}},
      {"Enable()", "Enable", switching(&Store::Enable), {}, true, {{"enable", "1"}}},
      {"Disable()", "Disable", switching(&Store::Disable), {}, true, {{"enable", "0"}}},
  };
  its.removals = {{{"Del"}, of<Store>(&Store::Del)}};
  its.lookups = {{"Get", "client_id", getByText<Store>()}};
  its.getById = getById<Store>();
  its.getAll = getAll<Store>();
  its.getIndex = of<Store>(&Store::GetIndex);
  return its;
}();

const StoreDescription kCodes = [] {
  using Store = OAUTHDBGrantCode;
  StoreDescription its;
  its.table = "oauth_grantCode";
  its.columns = {"username", "client_id", "scope", "code", "expired_time", "state", "ip"};
  its.row = {{"username", "alice"},    {"client_id", times(64, 'c')},  {"scope", "read"},
             {"code", times(64, 'a')}, {"expired_time", "1700000600"}, {"state", "xyz"},
             {"ip", "192.0.2.7"}};
  its.other = {{"username", "bob"},      {"client_id", times(64, 'd')}, {"scope", "write"},
               {"code", times(64, 'b')}, {"expired_time", "1"},         {"state", "new"},
               {"ip", "2001:db8::7"}};
  its.key = "code";
  its.secrets = {"code"};
  its.ceiling = "grantcode_max";
  its.full = "GrantCode Table is full";
  its.lifetime = "grantcode_expired";
  its.reportsBadLengths = false;
  its.open = opener<Store>("oauth_grantCode");
  its.changes = {
      {"full Add()",
       "Add",
       adding<Store>(add),
       {kUserName, kClientId, kScope, kCode, asGiven(kExpiredTime), kState, asGiven(kIp)},
       false},
      {"issuing Add()",
       "Add",
       adding<Store>(issue),
       {kUserName, kClientId, kScope, kState, asGiven(kIp)},
       false},
      {"short Edit()", "", editing<Store>(shortEdit),
       asGiven({kUserName, kClientId, kScope, kState})},
      {"long Edit()",
       "Edit",
       editing<Store>(longEdit),
       {kUserName, kClientId, kScope, asGiven(kExpiredTime), kState}},
      {"Revoke()", "Revoke", switching(&Store::Revoke), {}, true, {{"expired_time", "1700000000"}}},
  };
  its.removals = {{{"Del"}, of<Store>(&Store::Del)}};
  its.lookups = {{"Get", "code", getByText<Store>(), true}};
  its.getById = getById<Store>();
  its.getAll = getAll<Store>();
  its.getIndex = of<Store>(&Store::GetIndex);
  its.purge = of<Store>(&Store::Purge);
  return its;
}();

const StoreDescription kTokens = [] {
  using Store = OAUTHDBToken;
  StoreDescription its;
  its.table = "oauth_token";
  its.columns = {"username",  "client_id", "scope", "refresh_token", "access_token", "expired_time",
                 "flow_type", "state",     "ip"};
  its.row = {{"username", "alice"},
             {"client_id", times(64, 'c')},
             {"scope", "read"},
             {"refresh_token", times(64, 'r')},
             {"access_token", times(64, 'a')},
             {"expired_time", "1700000600"},
             {"flow_type", "code"},
             {"state", "xyz"},
             {"ip", "192.0.2.7"}};
  its.other = {{"username", "bob"},
               {"client_id", times(64, 'd')},
               {"scope", "write"},
               {"refresh_token", times(64, 's')},
               {"access_token", times(64, 'b')},
               {"expired_time", "1"},
               {"flow_type", "password"},
               {"state", "new"},
               {"ip", "2001:db8::7"}};
  its.key = "access_token";
  its.secrets = {"access_token", "refresh_token"};
  its.ceiling = "token_max";
  its.full = "Token Table is full";
  its.lifetime = "token_expired";
  its.open = opener<Store>("oauth_token");
  its.changes = {
      {"full Add()",
       "Add",
       adding<Store>(add),
       {kUserName, kClientId, kScope, kRefreshToken, kAccessToken, kExpiredTime, kFlowType, kState,
        kIp},
       false},
      {"issuing Add()",
       "Add",
       adding<Store>(issue),
       {kUserName, kClientId, kScope, kFlowType, kState, kIp},
       false},
      {"short Edit()", "Edit", editing<Store>(shortEdit),
       asGiven({kUserName, kClientId, kScope, kFlowType, kState})},
      {"long Edit()",
       "Edit",
       editing<Store>(longEdit),
       {kUserName, kClientId, kScope, asGiven(kExpiredTime), kFlowType, kState}},
  };
  its.removals = {{{"Del"}, of<Store>(&Store::Del)},
                  {{"Revoke", "Del"}, of<Store>(&Store::Revoke)}};
  its.lookups = {
      {"GetWithAccessToken", "access_token", of<Store>(&Store::GetWithAccessToken)},
      {"GetWithRefreshToken", "refresh_token", of<Store>(&Store::GetWithRefreshToken)},
  };
  its.getById = getById<Store>();
  its.getAll = getAll<Store>();
  its.getIndex = of<Store>(&Store::GetIndex);
  its.purge = of<Store>(&Store::Purge);
  return its;
}();

// No ids, no lengths, no ceiling that refuses.
const StoreDescription kAuditLog = [] {
  using Store = OAUTHDBLog;
  StoreDescription its;
  its.table = "oauth_log";
  its.columns = {"timestamp", "msg"};
  its.row = {{"timestamp", "10"}, {"msg", "hello"}};
  its.open = opener<Store>("oauth_log");
  its.changes = {{"Add()",
                  "Add",
                  [](OAUTHDBBasic& store, long long, const Row& row, Json::Value&) {
                    return static_cast<Store&>(store).Add(row.at("msg"));
                  },
                  {kMsg},
                  false}};
  its.removals = {{{"Del"}, of<Store>([](Store& log, long long) { return log.Del(); })}};
  its.getAll = of<Store>([](Store& log, Json::Value* rows) { return log.Get("", "", rows); });
  return its;
}();

const std::map<std::string, bool> kExpiries{
    {"1700000000", true},
    {"1699999999", false},
    {"0001700000000", true},
    {"2147483648", true},
    {"4294967296", true},
    {"9223372036854775807", true},
    {"9223372036854775808", true},
    {"99999999999999999999", true},
    {times(128, '9'), true},
    {"0", false},
    {"-1", false},
    {"-1700000001", false},
    {"-9223372036854775809", false},
    {"-" + times(127, '9'), false},
    {"", false},
    {"-", false},
    {"None", false},
    {"never", false},
    {"1800000000x", false},
    {"0x7fffffff", false},
    {times(30, '9') + "x", false},
};

// --- Fixture ---

Row with(Row row, const std::string& column, const std::string& value) {
  row.at(column) = value;
  return row;
}

std::string doubled(const std::string& value) {
  std::string result;
  for (const char c : value) result.append(c == '\'' ? 2 : 1, c);
  return result;
}

bool isSensitive(const std::string& column) {
  return column == "client_id" || column == "client_secret";
}
std::string sealedIf(const std::string& column, const std::string& value) {
  return isSensitive(column) ? FakeHost::sealed(value) : value;
}

std::string RowStoreTest::printed(const Row& row, const std::string& id) const {
  std::string result;
  for (const std::string& column : its_.columns) result += sealedIf(column, row.at(column)) + "|";
  return result + id;
}

void RowStoreTest::insert(const std::string& id, const Row& row) const {
  std::string values;
  for (const std::string& column : its_.columns)
    values += "'" + doubled(sealedIf(column, row.at(column))) + "', ";
  execute("INSERT INTO " + its_.table + " VALUES(" + values + id + ")");
}

Row RowStoreTest::insertRow(const std::string& id) const {
  Row row = its_.row;
  if (!its_.key.empty()) row[its_.key].replace(0, id.size(), id);
  insert(id, row);
  return row;
}

Row RowStoreTest::insertExpiring(const std::string& id, const std::string& expired_time) const {
  const Row row = insertRow(id);
  execute("UPDATE " + its_.table + " SET expired_time = '" + expired_time + "' WHERE id = " + id);
  return with(row, "expired_time", expired_time);
}

void RowStoreTest::refuseDeletes(const std::string& condition) const {
  execute("CREATE TRIGGER refusal BEFORE DELETE ON " + its_.table + " WHEN " + condition +
          " BEGIN SELECT RAISE(ABORT, 'kept'); END");
}

Json::Value RowStoreTest::document(const Row& row, const std::string& id) const {
  Json::Value result;
  for (const auto& [column, value] : row) result[column] = value;
  result["id"] = id;
  return result;
}

Json::Value RowStoreTest::list(const std::vector<Json::Value>& rows) {
  Json::Value result(Json::arrayValue);
  for (const Json::Value& row : rows) result.append(row);
  return result;
}

Json::Value RowStoreTest::secretsOf(const Row& row) const {
  Json::Value result;
  for (const std::string& column : its_.secrets) result[column] = row.at(column);
  return result;
}

Lines RowStoreTest::failed(const std::string& operation) const {
  return {base(operation + " failed[" + its_.table + "]")};
}

Lines RowStoreTest::failed(const std::string& operation, const std::string& error, int code) const {
  return {base("Run Command failed!![" + error + "][" + std::to_string(code) + "]"),
          failed(operation).front()};
}

Lines RowStoreTest::unready(const std::string& operation) const {
  return {base("DB is not ready!!"), failed(operation).front()};
}

Lines RowStoreTest::traced(int mask, const std::function<void(Store&)>& body) {
  withDiagnostics(mask, [&] {
    const std::shared_ptr<Store> store = its_.open();
    log_.clear();
    body(*store);
  });
  return log_.lines();
}

Lines RowStoreTest::traceOf(const Lookup& lookup, const Row& row, const std::string& id) const {
  const std::string& text = row.at(lookup.column);
  Lines lines{own("==> " + lookup.name), "3 oauth_utils.cpp checkStrLen[" + text + "]",
              base("==> DBGet")};
  if (lookup.column == "client_id") lines.push_back(base("==> ParamEncrypt[client_id]"));
  for (const char* const step : {"GetConditionParam", "ConcateParam", "DBCmd"})
    lines.push_back(base(std::string("==> ") + step));
  lines.push_back(base("==> DBCmdRun[SELECT * FROM " + its_.table + " WHERE " + lookup.column +
                       "='" + sealedIf(lookup.column, text) + "' ;]"));
  lines.push_back(base("==> TabGetCallback"));
  int index = 0;
  const auto dump = [&](const std::string& column, const std::string& value) {
    lines.push_back(
        base("##### [" + std::to_string(index++) + "][" + column + " = " + value + "]"));
  };
  for (const std::string& column : its_.columns) dump(column, sealedIf(column, row.at(column)));
  dump("id", id);
  for (const char* const column : {"client_id", "client_secret"})
    if (row.count(column) != 0)
      lines.push_back(base("==> ParamDecrypt[" + std::string(column) + "]"));
  lines.push_back(base("ClientInfo Get Done"));
  return lines;
}
