// Digests, comparisons of secrets, and base64.

#pragma once

#include <string>

namespace authserver {

inline constexpr std::size_t kDigestLength = 43;  // bytes, of what the next two functions return

// SHA-256 of the text, in base64url without padding.
std::string sha256(const std::string& text);

// HMAC-SHA-256 of the text with a key of 32 bytes, in the same encoding.
std::string authenticator(const std::string& key, const std::string& text);

// Takes a time that does not reveal where the texts differ.
bool equalSecrets(const std::string& a, const std::string& b);

std::string base64url(const std::string& bytes);

// The decoded bytes, "" if the text is not valid. base64url has no padding, base64 has.
std::string fromBase64url(const std::string& text);
std::string fromBase64(const std::string& text);

}  // namespace authserver
