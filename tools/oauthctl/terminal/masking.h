// Secrets are shown by their beginning only, enough to tell two of them apart.

#pragma once

#include <string>

namespace oauthctl {

inline std::string masked(const std::string& secret, bool show) {
  constexpr std::size_t kShown = 4, kLongEnough = 32;
  if (show) return secret;
  return (secret.size() < kLongEnough ? std::string() : secret.substr(0, kShown)) + "...";
}

}  // namespace oauthctl
