#include "digest.h"

#include <sodium.h>

#include <stdexcept>

namespace authserver {
namespace {

constexpr int kUrlVariant = sodium_base64_VARIANT_URLSAFE_NO_PADDING;

const unsigned char* bytesOf(const std::string& text) {
  return reinterpret_cast<const unsigned char*>(text.data());
}

std::string decoded(const std::string& text, int variant) {
  std::string bytes(text.size(), '\0');
  std::size_t length = 0;
  if (sodium_base642bin(reinterpret_cast<unsigned char*>(bytes.data()), bytes.size(), text.data(),
                        text.size(), nullptr, &length, nullptr, variant) != 0)
    return {};
  bytes.resize(length);
  return bytes;
}

}  // namespace

std::string base64url(const std::string& bytes) {
  std::string text(sodium_base64_encoded_len(bytes.size(), kUrlVariant), '\0');
  sodium_bin2base64(text.data(), text.size(), bytesOf(bytes), bytes.size(), kUrlVariant);
  text.pop_back();  // the terminating NUL
  return text;
}

std::string fromBase64url(const std::string& text) { return decoded(text, kUrlVariant); }

std::string fromBase64(const std::string& text) {
  return decoded(text, sodium_base64_VARIANT_ORIGINAL);
}

std::string sha256(const std::string& text) {
  std::string digest(crypto_hash_sha256_BYTES, '\0');
  crypto_hash_sha256(reinterpret_cast<unsigned char*>(digest.data()), bytesOf(text), text.size());
  return base64url(digest);
}

std::string authenticator(const std::string& key, const std::string& text) {
  if (key.size() != crypto_auth_hmacsha256_KEYBYTES) throw std::runtime_error("bad session.key");
  std::string code(crypto_auth_hmacsha256_BYTES, '\0');
  crypto_auth_hmacsha256(reinterpret_cast<unsigned char*>(code.data()), bytesOf(text), text.size(),
                         bytesOf(key));
  return base64url(code);
}

bool equalSecrets(const std::string& a, const std::string& b) {
  const std::string x = sha256(a), y = sha256(b);  // always of equal length
  return sodium_memcmp(x.data(), y.data(), x.size()) == 0;
}

}  // namespace authserver
