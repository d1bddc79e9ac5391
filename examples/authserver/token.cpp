// POST /token: a client exchanges a code or a refresh token for new tokens (RFC 6749,
// sections 4.1.3 and 6). Of any number of requests with the same code or refresh token, one
// succeeds.

#include "audit.h"
#include "client_authentication.h"
#include "clock.h"
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

// Somebody may have stolen the code: the tokens that were issued for it end (RFC 6749,
// section 4.1.2).
void revokeTokensOf(TokenStore& tokens, const std::string& code, const Client& client) {
  if (revokeIssuedFor(tokens, sha256(code), client.id) > 0)
    audit("code replayed, tokens revoked of " + quotedForLog(client.name));
}

// A removed user's grants are void.
void checkUser(const std::string& name) {
  if (!findUser(name)) throw invalidGrant("The user is gone.");
}

// Refuses the request. The code stays valid.
void checkCode(const Code& code, const std::string& redirectUri, const std::string& verifier) {
  if (unixNow() > code.expires) throw invalidGrant("The code has expired.");
  if (code.redirectDigest != sha256(redirectUri))
    throw invalidGrant("The redirect_uri is not the one that the code was asked for with.");
  if (code.challenge.empty() != verifier.empty())
    throw invalidGrant("A code_verifier belongs to a code_challenge, and the other way round.");
}

// One transaction spends the code and issues the tokens, so that a client which is told to try
// again still has its code. The audit log uses another connection, which cannot write before the
// transaction has ended.
Json::Value exchangeCode(TokenStore& tokens, const Request& http, const Client& client) {
  const std::string presented = http.required("code"), verifier = http.get("code_verifier");
  const std::string redirectUri = http.required("redirect_uri");
  Transaction transaction(tokens);
  const std::optional<Code> code = findCode(tokens, presented);
  if (!code || code->clientId != client.id) {
    transaction.rollBack();
    if (code)
      audit("code of another client presented by " + quotedForLog(client.name));
    else
      revokeTokensOf(tokens, presented, client);
    throw invalidGrant("The code is not valid.");
  }
  checkCode(*code, redirectUri, verifier);
  checkUser(code->user);
  if (!spend(tokens, *code)) throw invalidGrant("The code is not valid.");
  if (!code->challenge.empty() && !equalSecrets(code->challenge, sha256(verifier))) {
    transaction.commit();  // spends the code, so that nobody can guess the verifier
    audit("wrong code_verifier from " + quotedForLog(client.name));
    throw invalidGrant("The code_verifier does not fit the code.");
  }
  const Grant grant{code->user, client.id, code->scope, code->scope, sha256(presented)};
  Json::Value answer = issueTokens(tokens, grant, "authorization_code");
  transaction.commit();
  return answer;
}

Json::Value refresh(TokenStore& tokens, const Request& http, const Client& client) {
  Transaction transaction(tokens);
  const std::optional<Token> old = findRefreshToken(tokens, http.required("refresh_token"));
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
  const std::string type = http.required("grant_type");
  const auto exchange = type == "authorization_code" ? exchangeCode
                        : type == "refresh_token"    ? refresh
                                                     : nullptr;
  if (exchange == nullptr)
    throw Refusal(400, "unsupported_grant_type", "The grant_type is not known here.");
  TokenStore tokens;
  return jsonResponse(200, withRoom([&] { return exchange(tokens, http, client); },
                                    [&] { purgeLongExpired(tokens); }));
}

}  // namespace
}  // namespace authserver

int main() { return authserver::serve("token", authserver::token, authserver::jsonRefusal); }
