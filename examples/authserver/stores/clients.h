// Registered client applications.

#pragma once

#include <optional>
#include <string>

namespace authserver {

struct Client {
  std::string id, secret, redirectUri, scope, name;
};

// The client with that identifier; nothing if it is unknown or disabled.
std::optional<Client> findClient(const std::string& id);

}  // namespace authserver
