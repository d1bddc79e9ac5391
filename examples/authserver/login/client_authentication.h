// Which client calls, proven by its secret (RFC 6749, section 2.3).

#pragma once

#include "clients.h"
#include "http_request.h"

namespace authserver {

// By HTTP basic authentication or by the form's client_id and client_secret, never by both.
// Refuses with invalid_client whoever is unknown, disabled or has the wrong secret, all alike.
Client authenticatedClient(const Request& request);

}  // namespace authserver
