#include "zevocore_siv.h"

#include <nettle/base64.h>
#include <nettle/siv-cmac.h>

#include <vector>

namespace zevocore {
namespace {

using Bytes = std::vector<std::uint8_t>;

static_assert(std::tuple_size<Key>::value == SIV_CMAC_AES256_KEY_SIZE);

// A constant is used instead of a nonce, because equal texts must give equal results. It also
// distinguishes our texts from those that another program seals with the same key.
constexpr std::uint8_t kLabel[] = {'z', 'e', 'v', 'o', 'c', 'o', 'r', 'e'};

siv_cmac_aes256_ctx contextFor(const Key& key) {
  siv_cmac_aes256_ctx context;
  siv_cmac_aes256_set_key(&context, key.data());
  return context;
}

const std::uint8_t* bytesOf(const std::string& text) {
  return reinterpret_cast<const std::uint8_t*>(text.data());
}

std::string toBase64Url(const Bytes& bytes) {
  base64_encode_ctx context;
  base64url_encode_init(&context);
  std::string text(BASE64_ENCODE_LENGTH(bytes.size()) + BASE64_ENCODE_FINAL_LENGTH, '\0');
  std::size_t length = base64_encode_update(&context, text.data(), bytes.size(), bytes.data());
  length += base64_encode_final(&context, text.data() + length);
  text.resize(length);
  text.erase(text.find_last_not_of('=') + 1);
  return text;
}

// Returns nothing unless the text is exactly what toBase64Url() makes from the bytes. A lenient
// decoder would accept several spellings of one value.
std::optional<Bytes> fromBase64Url(const std::string& text) {
  base64_decode_ctx context;
  base64url_decode_init(&context);
  const std::string padded = text + std::string((4 - text.size() % 4) % 4, '=');
  Bytes bytes(BASE64_DECODE_LENGTH(padded.size()));
  std::size_t length = bytes.size();
  if (!base64_decode_update(&context, &length, bytes.data(), padded.size(), padded.data()) ||
      !base64_decode_final(&context))
    return std::nullopt;
  bytes.resize(length);
  if (toBase64Url(bytes) != text) return std::nullopt;
  return bytes;
}

}  // namespace

std::string seal(const Key& key, const std::string& plain) {
  const siv_cmac_aes256_ctx context = contextFor(key);
  Bytes sealed(SIV_DIGEST_SIZE + plain.size());
  siv_cmac_aes256_encrypt_message(&context, sizeof kLabel, kLabel, 0, nullptr, sealed.size(),
                                  sealed.data(), bytesOf(plain));
  return toBase64Url(sealed);
}

std::optional<std::string> unseal(const Key& key, const std::string& sealed) {
  const std::optional<Bytes> bytes = fromBase64Url(sealed);
  if (!bytes || bytes->size() < SIV_DIGEST_SIZE) return std::nullopt;
  const siv_cmac_aes256_ctx context = contextFor(key);
  std::string plain(bytes->size() - SIV_DIGEST_SIZE, '\0');
  if (!siv_cmac_aes256_decrypt_message(&context, sizeof kLabel, kLabel, 0, nullptr, plain.size(),
                                       reinterpret_cast<std::uint8_t*>(plain.data()),
                                       bytes->data()))
    return std::nullopt;
  return plain;
}

}  // namespace zevocore
