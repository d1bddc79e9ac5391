// Finds the client that sent a request, and checks its secret (RFC 6749, section 2.3).

#pragma once

#include "clients.h"
#include "http_request.h"

namespace authserver {

// The credentials come by HTTP basic authentication or as client_id and client_secret of the form,
// but not by both. Refuses an unknown client, a disabled one and a wrong secret in the same way,
// with invalid_client.
Client authenticatedClient(const Request& request);

}  // namespace authserver
