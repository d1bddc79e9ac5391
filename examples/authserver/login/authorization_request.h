// An authorization request (RFC 6749, section 4.1.1, and RFC 7636, section 4.3), checked.

#pragma once

#include "clients.h"
#include "form_encoding.h"
#include "http_request.h"
#include "refusal.h"

namespace authserver {

class AuthorizationRequest {
 public:
  // Refuses a client that is unknown or disabled, and a redirect URI that is not its own: nobody
  // may be sent anywhere then.
  explicit AuthorizationRequest(const Request& http);

  // Refuses whatever else is wrong; that is told to the client.
  void check();

  const Client& client() const { return client_; }
  const std::string& redirectUri() const { return redirectUri_; }
  const std::string& challenge() const { return challenge_; }
  // What a user can grant of it, once checked.
  const std::string& scope() const { return scope_; }

  // The parameters as they came, for a form or a URL that brings them again.
  const Fields& fields() const { return fields_; }

  // The client's own address with an answer in its query, state and issuer added (RFC 9207).
  std::string answer(Fields fields) const;
  std::string answer(const Refusal& refusal) const;

 private:
  const Request& http_;
  Client client_;
  std::string redirectUri_, challenge_, scope_;
  Fields fields_;
};

}  // namespace authserver
