#include "codes.h"

#include <stdexcept>

#include "digest.h"
#include "oauth_utils.h"
#include "refusal.h"
#include "store_errors.h"
#include "stored_text.h"

namespace authserver {
namespace {

// The column "state" is ours to use: "<digest of the redirect URI>.<challenge>", of a fixed length
// and without quotes, whatever the client sent.
std::string stateOf(const std::string& redirectDigest, const std::string& challenge) {
  return redirectDigest + '.' + challenge;
}

}  // namespace

CodeStore::CodeStore() : OAUTHDBGrantCode("oauth_grantCode") { requireOpen(*this); }

std::string issueCode(const std::string& user, const std::string& clientId,
                      const std::string& scope, const std::string& redirectUri,
                      const std::string& challenge) {
  CodeStore store;
  const std::string state = stateOf(sha256(redirectUri), challenge);
  Json::Value issued;
  const auto add = [&] {
    return attempt(store,
                   [&] { return store.Add(user, clientId, scope, state, getRemoteIP(), issued); });
  };
  const auto purge = [&] { attempt(store, [&] { return store.Purge(); }); };
  if (!withRoom(add, purge)) throw std::runtime_error("the code store refused a value");
  return issued["code"].asString();
}

std::optional<Code> findCode(CodeStore& store, const std::string& code) {
  Json::Value rows;
  if (!attempt(store, [&] { return store.Get(code, &rows); }) || rows.empty()) return std::nullopt;
  const Json::Value& row = rows[0U];
  const std::string state = storedText(row, "state");
  Code found;
  found.id = storedNumber(row, "id");
  found.user = storedText(row, "username");
  found.clientId = storedText(row, "client_id");
  found.scope = storedText(row, "scope");
  found.code = storedText(row, "code");
  found.expires = storedNumber(row, "expired_time");
  found.redirectDigest = state.substr(0, kDigestLength);
  if (state.size() > kDigestLength) found.challenge = state.substr(kDigestLength + 1);
  found.ip = storedText(row, "ip");
  return found;
}

void giveBack(CodeStore& store, const Code& code) {
  Json::Value issued;
  store.Add(code.user, code.clientId, code.scope, code.code, std::to_string(code.expires),
            stateOf(code.redirectDigest, code.challenge), code.ip, issued);
}

}  // namespace authserver
