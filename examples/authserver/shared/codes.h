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
  // What the code must be presented with: its redirect URI, of which the digest is kept, and for
  // PKCE (RFC 7636) the verifier of the challenge, which is "" if there is none.
  std::string redirectDigest, challenge;
  std::string ip;
};

// Issues a code; if the table is full, after the expired ones are gone.
std::string issueCode(const std::string& user, const std::string& clientId,
                      const std::string& scope, const std::string& redirectUri,
                      const std::string& challenge);

// Expired codes are found too.
std::optional<Code> findCode(CodeStore& store, const std::string& code);

// Makes a code valid again that was spent for nothing, because no token could be issued.
void giveBack(CodeStore& store, const Code& code);

}  // namespace authserver
