// Digests and comparisons of secrets.

#pragma once

#include <string>

namespace authserver {

inline constexpr std::size_t kDigestLength = 43;  // of what the next two return

// SHA-256 of the text, in base64url without padding.
std::string sha256(const std::string& text);

// HMAC-SHA-256 of the text by a key of 32 bytes, likewise.
std::string authenticator(const std::string& key, const std::string& text);

// In a time that does not tell where the texts differ.
bool equalSecrets(const std::string& a, const std::string& b);

std::string base64url(const std::string& bytes);
// "" if it is not base64url.
std::string fromBase64url(const std::string& text);

}  // namespace authserver
