#include "tokens.h"

#include <stdexcept>

#include "clock.h"
#include "digest.h"
#include "oauth_utils.h"
#include "store_errors.h"
#include "stored_text.h"
#include "transaction.h"

namespace authserver {
namespace {

// The library does not interpret the column "state". Here it holds "<digest of the code> <scope of
// the refresh token>".
std::string stateOf(const Grant& grant) { return grant.codeDigest + ' ' + grant.refreshScope; }

Token tokenOf(const Json::Value& row) {
  const std::string state = storedText(row, "state"), scope = storedText(row, "scope");
  const bool isOurForm = state.size() > kDigestLength + 1 && state[kDigestLength] == ' ';
  return {storedNumber(row, "id"),
          {storedText(row, "username"), storedText(row, "client_id"), scope,
           isOurForm ? state.substr(kDigestLength + 1) : scope, state.substr(0, kDigestLength)},
          storedNumber(row, "expired_time")};
}

std::optional<Token> firstToken(const Json::Value& rows) {
  if (rows.empty()) return std::nullopt;
  return tokenOf(rows[0U]);
}

}  // namespace

TokenStore::TokenStore() : OAUTHDBToken("oauth_token") { requireOpen(*this); }

std::optional<Token> findAccessToken(TokenStore& store, const std::string& token) {
  Json::Value rows(Json::arrayValue);
  attempt(store, [&] { return store.GetWithAccessToken(token, &rows); });
  return firstToken(rows);
}

std::optional<Token> findRefreshToken(TokenStore& store, const std::string& token) {
  Json::Value rows(Json::arrayValue);
  attempt(store, [&] { return store.GetWithRefreshToken(token, &rows); });
  return firstToken(rows);
}

Json::Value issueTokens(TokenStore& store, const Grant& grant, const std::string& flow) {
  Json::Value answer;
  if (!attempt(store, [&] {
        return store.Add(grant.user, grant.clientId, grant.accessScope, flow, stateOf(grant),
                         getRemoteIP(), answer);
      }))
    throw std::runtime_error("the token store refused a value");
  answer["token_type"] = "Bearer";
  answer["expires_in"] = getExpiredPeriod("token_expired");
  answer["scope"] = grant.accessScope;
  return answer;
}

int revokeIssuedFor(TokenStore& store, const std::string& codeDigest, const std::string& clientId) {
  Transaction transaction(store);
  Json::Value request, rows(Json::arrayValue);
  request["condition_like"] = getSQLFormatLikeStr("state", codeDigest);
  attempt(store, [&] { return store.DBGet(request, &rows); });
  int revoked = 0;
  for (const Json::Value& row : rows) {
    const Token token = tokenOf(row);
    if (token.grant.codeDigest == codeDigest && token.grant.clientId == clientId)
      revoked += attempt(store, [&] { return store.Revoke(token.id); }) ? 1 : 0;
  }
  transaction.commit();
  return revoked;
}

void purgeLongExpired(TokenStore& store) {
  constexpr std::int64_t kLongestPause = 30LL * 24 * 60 * 60;  // seconds without a refresh
  const std::int64_t oldest = unixNow() - kLongestPause;
  Transaction transaction(store);
  Json::Value rows(Json::arrayValue);
  attempt(store, [&] { return store.Get(&rows); });
  for (const Json::Value& row : rows)
    if (storedNumber(row, "expired_time") < oldest)
      attempt(store, [&] { return store.Del(storedNumber(row, "id")); });
  transaction.commit();
}

}  // namespace authserver
