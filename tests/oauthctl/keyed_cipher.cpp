// Replaces the host's libraries in a test build of oauthctl. It encrypts like their stand-in, with
// the key in the folder of the test.

#include <cstring>
#include <string>

#include "database/fixed_paths.h"
#include "host_libraries.h"
#include "zevocore_key.h"
#include "zevocore_siv.h"

namespace {

int deliver(const std::string& text, char* out, int outSize) {
  if (text.size() >= static_cast<std::size_t>(outSize)) return 0;
  std::memcpy(out, text.c_str(), text.size() + 1);
  return 1;
}

std::optional<zevocore::Key> key() { return zevocore::loadKey(oauthctl::fixed_paths::folder()); }

}  // namespace

int ZOCLCryptSzEncrypt(const char* plain, char* out, int outSize) {
  return key() ? deliver(zevocore::seal(*key(), plain), out, outSize) : 0;
}

int ZOCLCryptSzDecrypt(const char* cipher, char* out, int outSize) {
  const std::optional<std::string> plain = key() ? zevocore::unseal(*key(), cipher) : std::nullopt;
  return plain ? deliver(*plain, out, outSize) : 0;
}

int ZevoCgiGetRemoteIP(char* /*out*/, int /*outSize*/) { return -1; }
