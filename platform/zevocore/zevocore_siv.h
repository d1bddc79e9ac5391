// Deterministic authenticated encryption of short texts: AES-SIV (RFC 5297) with a 512-bit key,
// printed as URL-safe base64 without padding (RFC 4648, section 5).

#pragma once

#include <array>
#include <cstdint>
#include <optional>
#include <string>

namespace zevocore {

using Key = std::array<std::uint8_t, 64>;

// The same text with the same key always gives the same result.
std::string seal(const Key& key, const std::string& plain);

// Returns nothing if any character of the text was changed, or if it was sealed with another key.
std::optional<std::string> unseal(const Key& key, const std::string& sealed);

}  // namespace zevocore
