#include <sqlite3.h>

#include <cctype>

#include "commands/commands.h"
#include "database/grants.h"
#include "database/registry.h"
#include "decimal_text.h"
#include "oauth_clientInfo.h"
#include "oauth_utils.h"
#include "redirect_uri.h"
#include "terminal/exit_code.h"
#include "terminal/table_output.h"
#include "terminal/terminal.h"

namespace oauthctl {

using ZEVOOAUTHSERVER::OAUTHDBClientInfo;

namespace column = names::column;
namespace limit = names::limit;

namespace {

// Columns that the operator may set.
struct Field {
  const char* option;
  const char* column;
  names::Limit limit;
};
constexpr Field kName = {"--name", column::kDisplayName, limit::kDisplayName};
constexpr Field kRedirectUri = {"--redirect-uri", column::kRedirectUri, limit::kRedirectUri};
constexpr Field kScope = {"--scope", column::kScope, limit::kScope};

std::string fieldValue(const Invocation& invocation, const Field& field) {
  std::string value = invocation.value(field.option);
  // The library removes the scheme when it registers a client, but not when it edits one.
  if (field.option == kRedirectUri.option) value = ZEVOOAUTHSERVER::withoutScheme(value);
  if (!checkStrLen(value, field.limit.min, field.limit.max, false))
    throw Failure(ExitCode::kUsage, std::string(field.option) + " must have " +
                                        std::to_string(field.limit.min) + " to " +
                                        std::to_string(field.limit.max) + " bytes, not " +
                                        std::to_string(value.size()));
  for (const char c : value)
    if (std::iscntrl(static_cast<unsigned char>(c)) != 0)
      throw Failure(ExitCode::kUsage, std::string(field.option) + " holds a control character");
  return value;
}

struct Credentials {
  std::string identifier, secret;
};

[[noreturn]] void throwWhyNotAdded(OAUTHDBClientInfo& clients) {
  if (clients.GetErrCode() != ZEVOOAUTHSERVER::kErrTableFull)
    throwReason(clients, "register the client");
  // The library reports a full table also if it cannot count the rows.
  const int ceiling = getTableRowMax(names::setting::kClientInfoMax);
  clients.SetErrCode(SQLITE_OK);
  clients.DBCheckRowMax(static_cast<unsigned long>(ceiling));
  if (clients.GetErrCode() != SQLITE_OK) throwReason(clients, "register the client");
  throw Failure(ExitCode::kAttention, "the registry is full: it holds " + std::to_string(ceiling) +
                                          " clients, the setting " +
                                          names::setting::kClientInfoMax);
}

Credentials registerClient(const Invocation& invocation, const std::string& secret) {
  OAUTHDBClientInfo clients(names::table::kClientInfo);
  requireReady(clients);
  clients.SetErrCode(SQLITE_OK);
  Json::Value added;
  const std::string identifier = getRandomStr(limit::kClientId.max);
  if (clients.Add(identifier, secret.empty() ? getRandomStr(limit::kClientSecret.max) : secret,
                  fieldValue(invocation, kRedirectUri), fieldValue(invocation, kScope),
                  fieldValue(invocation, kName), invocation.has("--disabled") ? "0" : "1",
                  added) == 0)
    throwWhyNotAdded(clients);
  return {added[column::kClientId].asString(), added[column::kClientSecret].asString()};
}

// The number is null if it could not be read.
void printAdded(const Json::Value& number, const Credentials& added, bool asJson) {
  if (!asJson) {
    printPairs({{"id", number.isNull() ? "unknown" : number.asString()},
                {"client_id", added.identifier},
                {"client_secret", added.secret}});
    return;
  }
  Json::Value document;
  document["id"] = number;
  document["client_id"] = added.identifier;
  document["client_secret"] = added.secret;
  printJson(document);
}

// The secret from standard input, "" if the library is to make one.
std::string secretFromInput(const Invocation& invocation) {
  if (!invocation.has("--secret-from-stdin")) return {};
  std::string secret = readSecret("client secret");
  if (!checkStrLen(secret, limit::kClientSecret.min, limit::kClientSecret.max, false))
    throw Failure(ExitCode::kUsage, "a client secret has " +
                                        std::to_string(limit::kClientSecret.max) + " bytes, not " +
                                        std::to_string(secret.size()));
  return secret;
}

void setEnabled(const Invocation& invocation, bool enabled) {
  Database database(Access::kWrite);
  const Json::Value row = findClient(database, invocation.value("CLIENT"));
  const long long id = idForChange(row);
  OAUTHDBClientInfo clients(names::table::kClientInfo);
  requireReady(clients);
  const bool changed = attempt(clients, "change the client", [&] {
    return (enabled ? clients.Enable(id) : clients.Disable(id)) != 0;
  });
  if (!changed) throw Failure(ExitCode::kAttention, "the client was deleted meanwhile");
  say("client " + row[column::kId].asString() + (enabled ? " is enabled" : " is disabled"));
}

// "client 3, 'Photo album'"
std::string describe(const Json::Value& row) {
  return "client " + row[column::kId].asString() + ", '" +
         originalText(row[column::kDisplayName].asString()) + "'";
}

// Throws unless the client's row is still what was read before. Its number may be another client's.
void requireUnchanged(Database& database, const Json::Value& row) {
  Json::Value condition;
  condition[column::kId] = row[column::kId];
  const Json::Value now = database.rows(names::table::kClientInfo, condition);
  if (now.size() != 1 || now[0U] != row) throwChangedMeanwhile(describe(row) + ",");
}

std::string grantsText(int codes, int tokens) {
  return countText(codes, kCodes) + " and " + countText(tokens, kTokens);
}

void printClients(const Json::Value& documents, bool showSecrets) {
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
}

}  // namespace

void listClients(const Invocation& invocation) {
  Database database(Access::kRead);
  const bool showSecrets = invocation.has("--show-secrets");
  Json::Value documents(Json::arrayValue);
  for (const Json::Value& row : database.rows(names::table::kClientInfo))
    documents.append(clientDocument(row, showSecrets));
  if (invocation.has("--json")) {
    printJson(documents);
    return;
  }
  printClients(documents, showSecrets);
  if (documents.empty()) say("no clients");
}

void showClient(const Invocation& invocation) {
  Database database(Access::kRead);
  const Json::Value row = findClient(database, invocation.value("CLIENT"));
  const std::string identifier = row[column::kClientId].asString();
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
  const std::string secret = secretFromInput(invocation);
  const Credentials added = registerClient(invocation, secret);
  // Nobody else has the secret: print it, whatever happens now.
  Json::Value id;
  std::string problem;
  try {
    Database database(Access::kRead);
    id = idValue(findClient(database, added.identifier));
  } catch (const Failure& failure) {
    problem = failure.what();
  }
  printAdded(id, added, invocation.has("--json"));
  if (!problem.empty())
    throw Failure(ExitCode::kAttention,
                  "the client is registered, but its number cannot be read: " + problem);
}

// Changes only the columns given: another process may change the others meanwhile.
void editClient(const Invocation& invocation) {
  Json::Value modified;
  for (const Field& field : {kName, kRedirectUri, kScope})
    if (invocation.has(field.option))
      modified[field.column] = getSQLFormatStr(fieldValue(invocation, field));
  if (modified.isNull())
    throw Failure(ExitCode::kUsage, "nothing to change: give --name, --redirect-uri or --scope");
  Database database(Access::kWrite);
  Json::Value row;
  database.inTransaction([&] {
    row = findClient(database, invocation.value("CLIENT"));
    database.edit(names::table::kClientInfo, idForChange(row), modified);
  });
  say("client " + row[column::kId].asString() + " is changed");
}

void enableClient(const Invocation& invocation) { setEnabled(invocation, true); }
void disableClient(const Invocation& invocation) { setEnabled(invocation, false); }

void deleteClient(const Invocation& invocation) {
  Database database(Access::kWrite);
  const Json::Value row = findClient(database, invocation.value("CLIENT"));
  const long long id = idForChange(row);
  const std::string identifier = row[column::kClientId].asString();
  const bool withTokens = invocation.has("--with-tokens");
  const std::string held = grantsText(countOfClient(database, kCodes, identifier),
                                      countOfClient(database, kTokens, identifier));
  confirm(invocation, "Delete " + describe(row) +
                          (withTokens ? ", with its " + held : "; its " + held + " stay valid") +
                          "?");
  int codes = 0, tokens = 0;
  database.inTransaction([&] {
    requireUnchanged(database, row);
    database.remove(names::table::kClientInfo, id);
    if (!withTokens) return;
    codes = removeOfClient(database, kCodes, identifier);
    tokens = removeOfClient(database, kTokens, identifier);
  });
  say("deleted client " + row[column::kId].asString() +
      (withTokens ? ", " + grantsText(codes, tokens)
                  : "; its " + held + " stay valid, 'oauthctl token revoke --client " + identifier +
                        "' ends its logins"));
}

}  // namespace oauthctl
