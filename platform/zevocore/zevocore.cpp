// Stand-in for the host's core library, for machines other than the appliance. It encrypts strings
// with a key of its own. One machine cannot decrypt what another machine encrypted.

#include <cstring>
#include <exception>

#include "host_libraries.h"
#include "oauth_names.h"
#include "zevocore_key.h"
#include "zevocore_siv.h"

namespace {

// Copies the text with its NUL byte. If it does not fit, returns 0 and writes nothing.
int deliver(const std::string& text, char* out, int outSize) {
  if (outSize <= 0 || text.size() >= static_cast<std::size_t>(outSize)) return 0;
  std::memcpy(out, text.c_str(), text.size() + 1);
  return 1;
}

}  // namespace

[[gnu::visibility("default")]] int ZOCLCryptSzEncrypt(const char* plain, char* out,
                                                      int outSize) try {
  const std::optional<zevocore::Key> key = zevocore::loadKey(ZEVOOAUTHSERVER::names::path::kFolder);
  return key ? deliver(zevocore::seal(*key, plain), out, outSize) : 0;
} catch (const std::exception&) {
  return 0;
}

[[gnu::visibility("default")]] int ZOCLCryptSzDecrypt(const char* cipher, char* out,
                                                      int outSize) try {
  const std::optional<zevocore::Key> key = zevocore::loadKey(ZEVOOAUTHSERVER::names::path::kFolder);
  if (!key) return 0;
  const std::optional<std::string> plain = zevocore::unseal(*key, cipher);
  return plain ? deliver(*plain, out, outSize) : 0;
} catch (const std::exception&) {
  return 0;
}
