// Random bytes for keys and nonces.

#pragma once

#include <sodium.h>

#include <string>

namespace authserver {

inline std::string randomBytes(std::size_t count) {
  std::string bytes(count, '\0');
  randombytes_buf(bytes.data(), bytes.size());
  return bytes;
}

}  // namespace authserver
