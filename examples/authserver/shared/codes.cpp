#include "codes.h"

#include <stdexcept>

#include "digest.h"
#include "oauth_utils.h"
#include "refusal.h"
#include "store_errors.h"
#include "stored_text.h"

namespace authserver {

CodeStore::CodeStore() : OAUTHDBGrantCode("oauth_grantCode") { requireOpen(*this); }

// Digests have no quotes and a fixed length, whatever the client sent.
std::string codeBinding(const std::string& redirectUri, const std::string& challenge) {
  return sha256(redirectUri) + '.' + challenge;
}

std::string issueCode(const std::string& user, const std::string& clientId,
                      const std::string& scope, const std::string& binding) {
  CodeStore store;
  Json::Value issued;
  const auto add = [&] {
    return attempt(
        store, [&] { return store.Add(user, clientId, scope, binding, getRemoteIP(), issued); });
  };
  bool added = false;
  try {
    added = add();
  } catch (const TableFull&) {
    attempt(store, [&] { return store.Purge(); });
    try {
      added = add();
    } catch (const TableFull&) {
      throw temporarilyUnavailable();
    }
  }
  if (!added) throw std::runtime_error("the code store refused a value");
  return issued["code"].asString();
}

std::optional<Code> findCode(CodeStore& store, const std::string& code) {
  Json::Value rows;
  if (!attempt(store, [&] { return store.Get(code, &rows); }) || rows.empty()) return std::nullopt;
  const Json::Value& row = rows[0U];
  return Code{storedNumber(row, "id"),      storedText(row, "username"),
              storedText(row, "client_id"), storedText(row, "scope"),
              storedText(row, "code"),      storedNumber(row, "expired_time"),
              storedText(row, "state"),     storedText(row, "ip")};
}

void giveBack(CodeStore& store, const Code& code) {
  Json::Value issued;
  store.Add(code.user, code.clientId, code.scope, code.code, std::to_string(code.expires),
            code.binding, code.ip, issued);
}

}  // namespace authserver
