#include "random_bytes.h"

#include <fcntl.h>
#include <sys/random.h>
#include <unistd.h>

#include <cerrno>

#include "descriptor.h"

namespace ZEVOOAUTHSERVER {
namespace {

// Calls the source until the buffer is full; it may deliver less than was asked for.
template <class Source>
bool fill(unsigned char* buffer, std::size_t size, Source source) {
  while (size > 0) {
    const ssize_t count = source(buffer, size);
    if (count > 0) {
      buffer += count;
      size -= static_cast<std::size_t>(count);
    } else if (count == 0 || errno != EINTR) {
      return false;
    }
  }
  return true;
}

bool fillFromDevice(unsigned char* buffer, std::size_t size) {
  const Descriptor device(open("/dev/urandom", O_RDONLY | O_CLOEXEC));
  return device.isOpen() && fill(buffer, size, [&device](unsigned char* rest, std::size_t missing) {
           return read(device.value(), rest, missing);
         });
}

}  // namespace

bool fillWithRandomBytes(unsigned char* buffer, std::size_t size) {
  const auto system = [](unsigned char* rest, std::size_t missing) {
    return getrandom(rest, missing, 0);
  };
  return fill(buffer, size, system) || fillFromDevice(buffer, size);
}

}  // namespace ZEVOOAUTHSERVER
