// Stand-in for the host's web-request library, for machines other than the appliance. It reads the
// client's address from the variable of the Common Gateway Interface (RFC 3875).

#include <cstdlib>
#include <cstring>

#include "host_libraries.h"

[[gnu::visibility("default")]] int ZevoCgiGetRemoteIP(char* out, int outSize) {
  const char* const address = std::getenv("REMOTE_ADDR");
  if (address == nullptr || *address == '\0') return -1;
  const std::size_t length = std::strlen(address);
  if (outSize <= 0 || length >= static_cast<std::size_t>(outSize)) return -1;
  std::memcpy(out, address, length + 1);
  return 0;
}
