// POST /token: a client trades a code, or a refresh token, for new tokens (RFC 6749, sections 4.1.3
// and 6). Of any number of tries with one code or refresh token, one succeeds.

#include <ctime>

#include "audit.h"
#include "client_authentication.h"
#include "codes.h"
#include "digest.h"
#include "endpoint.h"
#include "scope.h"
#include "store_errors.h"
#include "tokens.h"
#include "transaction.h"

namespace authserver {
namespace {

std::string required(const Request& http, const char* name) {
  std::string value = http.get(name);
  if (value.empty()) throw invalidRequest(std::string(name) + " is missing.");
  return value;
}

// The code may have been stolen and used: what was issued for it ends (RFC 6749, section 4.1.2).
void endGrantOf(TokenStore& tokens, const std::string& code, const Client& client) {
  if (revokeIssuedFor(tokens, sha256(code), client.id) > 0)
    audit("code replayed, tokens revoked of " + quotedForLog(client.name));
}

// What is refused without harm to the code.
void checkCode(const Code& code, const std::string& redirectUri, const std::string& verifier) {
  if (static_cast<std::int64_t>(std::time(nullptr)) > code.expires)
    throw invalidGrant("The code has expired.");
  if (code.redirectDigest != sha256(redirectUri))
    throw invalidGrant("The redirect_uri is not the one that the code was asked for with.");
  if (code.challenge.empty() != verifier.empty())
    throw invalidGrant("A code_verifier belongs to a code_challenge, and the other way round.");
}

// The code, which nobody else can spend any more. A wrong verifier spends it too: it must not be
// guessed at.
Code spentCode(CodeStore& codes, TokenStore& tokens, const Client& client, const Request& http) {
  const std::string presented = required(http, "code"), verifier = http.get("code_verifier");
  const std::string redirectUri = required(http, "redirect_uri");
  Transaction transaction(codes);
  const std::optional<Code> code = findCode(codes, presented);
  if (!code || code->clientId != client.id) {
    transaction.rollBack();  // which other stores, the log among them, would wait for in vain
    if (code)
      audit("code of another client presented by " + quotedForLog(client.name));
    else
      endGrantOf(tokens, presented, client);
    throw invalidGrant("The code is not valid.");
  }
  checkCode(*code, redirectUri, verifier);
  attempt(codes, [&] { return codes.Del(code->id); });
  transaction.commit();
  if (code->challenge.empty() || equalSecrets(code->challenge, sha256(verifier))) return *code;
  audit("wrong code_verifier from " + quotedForLog(client.name));
  throw invalidGrant("The code_verifier does not fit the code.");
}

Json::Value tradeCode(const Request& http, const Client& client) {
  CodeStore codes;
  TokenStore tokens;  // opened before anything is spent
  const Code code = spentCode(codes, tokens, client, http);
  const Grant grant{code.user, client.id, code.scope, code.scope, sha256(code.code)};
  try {
    return withRoom([&] { return issueTokens(tokens, grant, "authorization_code"); },
                    [&] { purgeLongExpired(tokens); });
  } catch (const std::exception&) {
    giveBack(codes, code);
    throw;
  }
}

Json::Value rotate(TokenStore& tokens, const Request& http, const Client& client) {
  Transaction transaction(tokens);
  const std::optional<Token> old = findRefreshToken(tokens, required(http, "refresh_token"));
  if (!old || old->grant.clientId != client.id)
    throw invalidGrant("The refresh token is not valid.");
  Grant grant = old->grant;
  grant.accessScope = narrowed(http.get("scope"), grant.refreshScope);
  attempt(tokens, [&] { return tokens.Revoke(old->id); });
  Json::Value answer = issueTokens(tokens, grant, "refresh_token");
  transaction.commit();
  return answer;
}

Response token(const Request& http) {
  http.requireSoundParameters();
  const Client client = authenticatedClient(http);
  const std::string type = required(http, "grant_type");
  if (type == "authorization_code") return jsonResponse(200, tradeCode(http, client));
  if (type != "refresh_token")
    throw Refusal(400, "unsupported_grant_type", "The grant_type is not known here.");
  TokenStore tokens;
  return jsonResponse(200, withRoom([&] { return rotate(tokens, http, client); },
                                    [&] { purgeLongExpired(tokens); }));
}

}  // namespace
}  // namespace authserver

int main() { return authserver::serve({"POST"}, authserver::token, authserver::jsonRefusal); }
