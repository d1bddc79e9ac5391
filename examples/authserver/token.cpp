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
#include "users.h"

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

// Who was removed has nothing more to allow.
void checkUser(const std::string& name) {
  if (!findUser(name)) throw invalidGrant("The user is gone.");
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

// The code is spent if and only if the tokens are issued: whoever is told to try again can. The log
// is another connection, and would wait for an open transaction in vain.
Json::Value tradeCode(TokenStore& tokens, const Request& http, const Client& client) {
  const std::string presented = required(http, "code"), verifier = http.get("code_verifier");
  const std::string redirectUri = required(http, "redirect_uri");
  Transaction transaction(tokens);
  const std::optional<Code> code = findCode(tokens, presented);
  if (!code || code->clientId != client.id) {
    transaction.rollBack();
    if (code)
      audit("code of another client presented by " + quotedForLog(client.name));
    else
      endGrantOf(tokens, presented, client);
    throw invalidGrant("The code is not valid.");
  }
  checkCode(*code, redirectUri, verifier);
  checkUser(code->user);
  if (!spend(tokens, *code)) throw invalidGrant("The code is not valid.");
  if (!code->challenge.empty() && !equalSecrets(code->challenge, sha256(verifier))) {
    transaction.commit();  // spent for nothing, so that nobody guesses at the verifier
    audit("wrong code_verifier from " + quotedForLog(client.name));
    throw invalidGrant("The code_verifier does not fit the code.");
  }
  const Grant grant{code->user, client.id, code->scope, code->scope, sha256(presented)};
  Json::Value answer = issueTokens(tokens, grant, "authorization_code");
  transaction.commit();
  return answer;
}

Json::Value rotate(TokenStore& tokens, const Request& http, const Client& client) {
  Transaction transaction(tokens);
  const std::optional<Token> old = findRefreshToken(tokens, required(http, "refresh_token"));
  if (!old || old->grant.clientId != client.id)
    throw invalidGrant("The refresh token is not valid.");
  checkUser(old->grant.user);
  Grant grant = old->grant;
  grant.accessScope = narrowed(http.get("scope"), grant.refreshScope);
  if (!attempt(tokens, [&] { return tokens.Revoke(old->id); }))
    throw invalidGrant("The refresh token is not valid.");
  Json::Value answer = issueTokens(tokens, grant, "refresh_token");
  transaction.commit();
  return answer;
}

Response token(const Request& http) {
  http.requireSoundParameters();
  const Client client = authenticatedClient(http);
  const std::string type = required(http, "grant_type");
  const auto trade = type == "authorization_code" ? tradeCode
                     : type == "refresh_token"    ? rotate
                                                  : nullptr;
  if (trade == nullptr)
    throw Refusal(400, "unsupported_grant_type", "The grant_type is not known here.");
  TokenStore tokens;
  return jsonResponse(200, withRoom([&] { return trade(tokens, http, client); },
                                    [&] { purgeLongExpired(tokens); }));
}

}  // namespace
}  // namespace authserver

int main() { return authserver::serve({"POST"}, authserver::token, authserver::jsonRefusal); }
