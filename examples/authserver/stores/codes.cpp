#include "codes.h"

#include <stdexcept>

#include "digest.h"
#include "oauth_grantCode.h"
#include "oauth_utils.h"
#include "refusal.h"
#include "store_errors.h"
#include "stored_text.h"

namespace authserver {
namespace {

constexpr char kTable[] = "oauth_grantCode";
constexpr std::size_t kCodeLength = 64;  // bytes

// Makes a store use the table of the codes during the lifetime of this object.
class CodeTableScope {
 public:
  explicit CodeTableScope(ZEVOOAUTHSERVER::OAUTHDBBasic& store)
      : store_(store), ownTable_(store.GetTabName()) {
    store_.SetTabName(kTable);
  }
  ~CodeTableScope() { store_.SetTabName(ownTable_); }
  CodeTableScope(const CodeTableScope&) = delete;
  CodeTableScope& operator=(const CodeTableScope&) = delete;

 private:
  ZEVOOAUTHSERVER::OAUTHDBBasic& store_;
  const std::string ownTable_;
};

}  // namespace

std::string issueCode(const std::string& user, const std::string& clientId,
                      const std::string& scope, const std::string& redirectUri,
                      const std::string& challenge) {
  ZEVOOAUTHSERVER::OAUTHDBGrantCode store(kTable);
  requireOpen(store);
  // The library does not interpret the column "state". Here it holds "<digest of the redirect
  // URI>.<challenge>": neither part has quotes, and the digest has a fixed length.
  const std::string state = sha256(redirectUri) + '.' + challenge;
  Json::Value issued;
  const auto add = [&] {
    return attempt(store,
                   [&] { return store.Add(user, clientId, scope, state, getRemoteIP(), issued); });
  };
  const auto purge = [&] { attempt(store, [&] { return store.Purge(); }); };
  if (!withRoom(add, purge)) throw std::runtime_error("the code store refused a value");
  return issued["code"].asString();
}

std::optional<Code> findCode(TokenStore& tokens, const std::string& code) {
  if (code.size() != kCodeLength) return std::nullopt;
  const CodeTableScope codes(tokens);
  Json::Value request, rows(Json::arrayValue);
  request["condition"]["code"] = code;
  attempt(tokens, [&] { return tokens.DBGet(request, &rows); });
  if (rows.empty()) return std::nullopt;
  const Json::Value& row = rows[0U];
  const std::string state = storedText(row, "state");
  Code found;
  found.id = storedNumber(row, "id");
  found.user = storedText(row, "username");
  found.clientId = storedText(row, "client_id");
  found.scope = storedText(row, "scope");
  found.expires = storedNumber(row, "expired_time");
  found.redirectDigest = state.substr(0, kDigestLength);
  if (state.size() > kDigestLength) found.challenge = state.substr(kDigestLength + 1);
  return found;
}

bool spend(TokenStore& tokens, const Code& code) {
  const CodeTableScope codes(tokens);
  return attempt(tokens, [&] { return tokens.Del(code.id); });
}

}  // namespace authserver
