// Who sits at the browser: a cookie signed by this server, good for an hour. Nothing is stored.

#pragma once

#include <string>

#include "http_request.h"
#include "refusal.h"

namespace authserver {

struct Session {
  std::string cookie;  // its value
  std::string user;    // "" before login
};

// The session of the request's cookie, or a new one before login.
Session currentSession(const Request& request);

// A new session; user is "" before login. Login gets a new one, so that nobody can have planted
// its cookie beforehand.
Session newSession(const std::string& user);

// The headers that keep the session in the browser.
Headers sessionHeaders(const Session& session);

// What a form of this session for this authorization request must carry, so that another site
// cannot send it in the user's name.
std::string formToken(const Session& session, const std::string& authorizationRequest);

}  // namespace authserver
