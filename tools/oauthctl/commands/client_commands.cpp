#include <cctype>

#include "commands.h"
#include "exit_code.h"
#include "grants.h"
#include "human_time.h"
#include "oauth_clientInfo.h"
#include "oauth_utils.h"
#include "registry.h"
#include "table_output.h"
#include "terminal.h"

namespace oauthctl {

using ZEVOOAUTHSERVER::OAUTHDBClientInfo;

namespace {

// Columns that the operator may give, their options and lengths in bytes.
struct Field {
  const char* option;
  const char* column;
  int shortest, longest;
};
constexpr Field kName = {"--name", "display_name", 1, 64};
constexpr Field kRedirectUri = {"--redirect-uri", "redirect_uri", 3, 2048};
constexpr Field kScope = {"--scope", "scope", 1, 2048};

// As the library does when it registers a client, and not when it edits one: the two would not
// compare equal.
std::string withoutScheme(const std::string& uri) {
  for (const std::string scheme : {"https://", "http://"})
    if (uri.compare(0, scheme.size(), scheme) == 0) return uri.substr(scheme.size());
  return uri;
}

std::string fieldValue(const Invocation& invocation, const Field& field) {
  std::string value = invocation.value(field.option);
  if (field.option == kRedirectUri.option) value = withoutScheme(value);
  if (!checkStrLen(value, field.shortest, field.longest, false))
    throw Failure(ExitCode::kUsage, std::string(field.option) + " must have " +
                                        std::to_string(field.shortest) + " to " +
                                        std::to_string(field.longest) + " bytes, not " +
                                        std::to_string(value.size()));
  for (const char c : value)
    if (std::iscntrl(static_cast<unsigned char>(c)) != 0)
      throw Failure(ExitCode::kUsage, std::string(field.option) + " holds a control character");
  return value;
}

struct Made {
  std::string identifier, secret;
};

[[noreturn]] void throwWhyNotAdded(OAUTHDBClientInfo& clients) {
  if (clients.GetErrCode() != ZEVOOAUTHSERVER::kErrTableFull)
    throwReason(clients, "register the client");
  // The library calls a table full also when it could not count its rows.
  const int ceiling = getTableRowMax("client_info_max");
  clients.SetErrCode(0);
  clients.DBCheckRowMax(static_cast<unsigned long>(ceiling));
  if (clients.GetErrCode() != 0) throwReason(clients, "register the client");
  throw Failure(ExitCode::kAttention, "the registry is full: it holds " + std::to_string(ceiling) +
                                          " clients, the setting client_info_max");
}

Made registerClient(const Invocation& invocation, const std::string& secret) {
  OAUTHDBClientInfo clients(kClientTable);
  requireReady(clients);
  clients.SetErrCode(0);
  Json::Value made;
  const std::string identifier = getRandomStr(64);
  if (clients.Add(identifier, secret.empty() ? getRandomStr(64) : secret,
                  fieldValue(invocation, kRedirectUri), fieldValue(invocation, kScope),
                  fieldValue(invocation, kName), invocation.has("--disabled") ? "0" : "1",
                  made) == 0)
    throwWhyNotAdded(clients);
  return {made["client_id"].asString(), made["client_secret"].asString()};
}

std::string callersSecret(const Invocation& invocation) {
  if (!invocation.has("--secret-from-stdin")) return {};
  std::string secret = readSecret("client secret");
  if (!checkStrLen(secret, 64, 64, false))
    throw Failure(ExitCode::kUsage,
                  "a client secret has 64 bytes, not " + std::to_string(secret.size()));
  return secret;
}

void setEnabled(const Invocation& invocation, bool enabled) {
  Database database(Access::kWrite);
  const Json::Value row = findClient(database, invocation.value("CLIENT"));
  const long long id = idForChange(row);
  OAUTHDBClientInfo clients(kClientTable);
  requireReady(clients);
  const bool changed = attempt(clients, "change the client", [&] {
    return (enabled ? clients.Enable(id) : clients.Disable(id)) != 0;
  });
  if (!changed) throw Failure(ExitCode::kAttention, "the client was deleted meanwhile");
  say("client " + row["id"].asString() + (enabled ? " is enabled" : " is disabled"));
}

}  // namespace

void listClients(const Invocation& invocation) {
  Database database(Access::kRead);
  const bool showSecrets = invocation.has("--show-secrets");
  Json::Value documents(Json::arrayValue);
  for (const Json::Value& row : database.rows(kClientTable))
    documents.append(clientDocument(row, showSecrets));
  if (invocation.has("--json")) {
    printJson(documents);
    return;
  }
  std::vector<Column> columns = {{"ID", true}, {"NAME"}, {"ENABLED"}, {"REDIRECT URI"}, {"SCOPE"}};
  if (showSecrets) columns.insert(columns.end(), {{"CLIENT ID"}, {"CLIENT SECRET"}});
  Table table(columns);
  for (const Json::Value& client : documents) {
    const bool enabled = client["enabled"].asBool();
    std::vector<std::string> cells = {client["id"].asString(), client["display_name"].asString(),
                                      enabled ? "yes" : "no", client["redirect_uri"].asString(),
                                      client["scope"].asString()};
    if (showSecrets)
      cells.insert(cells.end(),
                   {client["client_id"].asString(), client["client_secret"].asString()});
    table.add(cells, enabled ? Tone::kPlain : Tone::kFaint);
  }
  table.print();
  if (documents.empty()) say("no clients");
}

void showClient(const Invocation& invocation) {
  Database database(Access::kRead);
  const Json::Value row = findClient(database, invocation.value("CLIENT"));
  const std::string identifier = row["client_id"].asString();
  Json::Value document = clientDocument(row, invocation.has("--show-secrets"));
  document["codes"] = countOfClient(database, kCodes, identifier);
  document["tokens"] = countOfClient(database, kTokens, identifier);
  if (invocation.has("--json")) {
    printJson(document);
    return;
  }
  printPairs({{"id", document["id"].asString()},
              {"name", document["display_name"].asString()},
              {"enabled", document["enabled"].asBool() ? "yes" : "no"},
              {"client_id", identifier},
              {"client_secret", document["client_secret"].asString()},
              {"redirect_uri", document["redirect_uri"].asString()},
              {"scope", document["scope"].asString()},
              {"codes", document["codes"].asString()},
              {"tokens", document["tokens"].asString()}});
}

void addClient(const Invocation& invocation) {
  for (const Field& field : {kName, kRedirectUri, kScope}) fieldValue(invocation, field);
  requireDatabase(Access::kMake);
  const std::string secret = callersSecret(invocation);
  const Made made = registerClient(invocation, secret);
  Database database(Access::kRead);
  const Json::Value id = findClient(database, made.identifier)["id"];
  if (invocation.has("--json")) {
    Json::Value document;
    document["id"] = static_cast<Json::Int64>(number(id.asString()).value_or(0));
    document["client_id"] = made.identifier;
    document["client_secret"] = made.secret;
    printJson(document);
    return;
  }
  printPairs(
      {{"id", id.asString()}, {"client_id", made.identifier}, {"client_secret", made.secret}});
}

// Only the columns given: what another process changes in the others meanwhile is not undone.
void editClient(const Invocation& invocation) {
  Json::Value modified;
  for (const Field& field : {kName, kRedirectUri, kScope})
    if (invocation.has(field.option))
      modified[field.column] = getSQLFormatStr(fieldValue(invocation, field));
  if (modified.isNull())
    throw Failure(ExitCode::kUsage, "nothing to change: give --name, --redirect-uri or --scope");
  Database database(Access::kWrite);
  const Json::Value row = findClient(database, invocation.value("CLIENT"));
  if (!database.edit(kClientTable, idForChange(row), modified))
    throw Failure(ExitCode::kAttention, "the client was deleted meanwhile");
  say("client " + row["id"].asString() + " is changed");
}

void enableClient(const Invocation& invocation) { setEnabled(invocation, true); }
void disableClient(const Invocation& invocation) { setEnabled(invocation, false); }

void deleteClient(const Invocation& invocation) {
  Database database(Access::kWrite);
  const Json::Value row = findClient(database, invocation.value("CLIENT"));
  const long long id = idForChange(row);
  const std::string identifier = row["client_id"].asString();
  const bool withTokens = invocation.has("--with-tokens");
  const auto grants = [&](int codes, int tokens) {
    return counted(codes, kCodes) + " and " + counted(tokens, kTokens);
  };
  const std::string held = grants(countOfClient(database, kCodes, identifier),
                                  countOfClient(database, kTokens, identifier));
  confirm(invocation, "Delete client " + row["id"].asString() + ", '" +
                          asGiven(row["display_name"].asString()) + "'" +
                          (withTokens ? ", with its " + held : "; its " + held + " stay valid") +
                          "?");
  int codes = 0, tokens = 0;
  database.inTransaction([&] {
    if (!database.remove(kClientTable, id))
      throw Failure(ExitCode::kAttention, "the client was deleted meanwhile");
    if (!withTokens) return;
    codes = removeOfClient(database, kCodes, identifier);
    tokens = removeOfClient(database, kTokens, identifier);
  });
  say("deleted client " + row["id"].asString() +
      (withTokens ? ", " + grants(codes, tokens)
                  : "; its " + held + " stay valid, 'oauthctl token revoke --client " + identifier +
                        "' ends its logins"));
}

}  // namespace oauthctl
