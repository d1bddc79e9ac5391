// An authorization request (RFC 6749, section 4.1.1, and RFC 7636, section 4.3) and its checks.

#pragma once

#include "clients.h"
#include "form_encoding.h"
#include "http_request.h"
#include "refusal.h"

namespace authserver {

class AuthorizationRequest {
 public:
  // Refuses a client that is unknown or disabled, and a redirect URI that does not belong to it.
  // The browser must not be redirected after such a refusal.
  explicit AuthorizationRequest(const Request& http);

  // Refuses everything else that is wrong. The client learns such a refusal by a redirect.
  void check();

  const Client& client() const { return client_; }
  const std::string& redirectUri() const { return redirectUri_; }
  const std::string& challenge() const { return challenge_; }
  // The part of the scope that a user can grant. check() sets it.
  const std::string& scope() const { return scope_; }

  // The parameters as received, for a form or a URL that sends them again.
  const Fields& fields() const { return fields_; }

  // The redirect URI with the answer in its query. Adds state and issuer (RFC 9207).
  std::string answerUrl(Fields answer) const;
  std::string answerUrl(const Refusal& refusal) const;

 private:
  const Request& http_;
  Client client_;
  std::string redirectUri_, challenge_, scope_;
  Fields fields_;
};

}  // namespace authserver
