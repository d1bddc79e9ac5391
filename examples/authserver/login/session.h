// Who uses the browser: a cookie that this server signs and that is valid for an hour. The server
// stores nothing.

#pragma once

#include <string>

#include "http_request.h"
#include "refusal.h"

namespace authserver {

struct Session {
  std::string cookie;  // its value
  std::string user;    // "" before login
};

// The session of the request's cookie, or a new one without a user.
Session currentSession(const Request& request);

// A new session; user is "" before login. Login starts a new one, so that a cookie which an
// attacker planted before the login is worth nothing.
Session newSession(const std::string& user);

// The headers that store the session in the browser.
Headers sessionHeaders(const Session& session);

// The value that a form of this session for this authorization request must contain. Another site
// does not know it and cannot send the form in the user's name.
std::string formToken(const Session& session, const std::string& authorizationRequest);

}  // namespace authserver
