#include <utility>

#include "commands/commands.h"
#include "database/grants.h"
#include "oauth_token.h"
#include "terminal/exit_code.h"
#include "terminal/table_output.h"
#include "terminal/terminal.h"
#include "unix_time.h"

namespace oauthctl {

using ZEVOOAUTHSERVER::OAUTHDBToken;
using ZEVOOAUTHSERVER::unixNow;

namespace {

bool hasTokenLength(const std::string& text) {
  const auto length = static_cast<int>(text.size());
  return length >= names::limit::kToken.min && length <= names::limit::kToken.max;
}

// The row of the token, null if there is none.
Json::Value rowOf(OAUTHDBToken& tokens, const std::string& token) {
  Json::Value rows;
  if (!hasTokenLength(token)) return {};
  attempt(tokens, "look the token up",
          [&] { return tokens.GetWithAccessToken(token, &rows) != 0; });
  return std::as_const(rows)[0U];
}

// Whether the library accepts the token. Throws if the look-up fails.
bool isValid(OAUTHDBToken& tokens, const std::string& token) {
  if (!hasTokenLength(token)) return false;
  Json::Value answer;
  return attempt(tokens, "verify the token", [&] { return tokens.Verify(token, answer) != 0; });
}

std::vector<std::pair<std::string, std::string>> pairsOf(const Json::Value& document,
                                                         const Json::Value& row,
                                                         const Registry& registry) {
  return {{"id", document["id"].asString()},
          {"user", document["username"].asString()},
          {"client", registry.describe(row[names::column::kClientId].asString())},
          {"client_id", row[names::column::kClientId].asString()},
          {"scope", document["scope"].asString()},
          {"state", document["state"].asString()},
          {"flow_type", document["flow_type"].asString()},
          {"ip", document["ip"].asString()},
          {"expires", expiryText(row, unixNow())},
          {"access_token", document["access_token"].asString()},
          {"refresh_token", document["refresh_token"].asString()}};
}

}  // namespace

void showToken(const Invocation& invocation) {
  Json::Value condition;
  condition[names::column::kId] = static_cast<Json::Int64>(rowNumber(invocation.value("N")));
  Database database(Access::kRead);
  const Json::Value rows = database.rows(names::table::kToken, condition);
  if (rows.empty())
    throw Failure(ExitCode::kAttention, "there is no token " + invocation.value("N"));
  const Registry registry(database);
  const Json::Value document =
      grantDocument(kTokens, rows[0U], registry, invocation.has("--show-secrets"));
  if (invocation.has("--json"))
    printJson(document);
  else
    printPairs(pairsOf(document, rows[0U], registry));
}

void verifyToken(const Invocation& invocation) {
  requireDatabase(Access::kRead);
  const std::string token = readSecret("access token");
  Database database(Access::kRead);
  OAUTHDBToken tokens(names::table::kToken);
  requireReady(tokens);
  const bool valid = isValid(tokens, token);
  const Json::Value row = rowOf(tokens, token);
  const Registry registry(database);
  if (invocation.has("--json")) {
    Json::Value document;
    document["valid"] = valid;
    document["token"] =
        row.isNull() ? Json::nullValue : grantDocument(kTokens, row, registry, false);
    printJson(document);
  } else if (valid && !row.isNull()) {
    printPairs(pairsOf(grantDocument(kTokens, row, registry, false), row, registry));
  }
  if (valid) return;
  throw Failure(ExitCode::kAttention, row.isNull()
                                          ? "not valid: no such access token"
                                          : "not valid: it expired " + expiryText(row, unixNow()));
}

}  // namespace oauthctl
