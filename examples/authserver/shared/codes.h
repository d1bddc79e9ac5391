// Authorization codes, and what is remembered with one.

#pragma once

#include <cstdint>
#include <optional>
#include <string>

#include "oauth_grantCode.h"

namespace authserver {

// The store, which has opened or refuses the request.
class CodeStore : public ZEVOOAUTHSERVER::OAUTHDBGrantCode {
 public:
  CodeStore();
};

struct Code {
  long long id;
  std::string user, clientId, scope, code;
  std::int64_t expires;  // Unix seconds
  std::string binding, ip;
};

// What the code will have to be presented with: its redirect URI and, for PKCE (RFC 7636), the
// challenge, "" if there is none.
std::string codeBinding(const std::string& redirectUri, const std::string& challenge);

// Issues a code; if the table is full, after the expired ones are gone.
std::string issueCode(const std::string& user, const std::string& clientId,
                      const std::string& scope, const std::string& binding);

// Expired codes are found too.
std::optional<Code> findCode(CodeStore& store, const std::string& code);

// Makes a code valid again that was spent for nothing, because no token could be issued.
void giveBack(CodeStore& store, const Code& code);

}  // namespace authserver
