// The key of the encryption stand-in: 64 random bytes in a file of mode 0600.

#pragma once

#include <optional>
#include <string>

#include "zevocore_siv.h"

namespace zevocore {

// Reads the key from "zevocore.key" in the directory, making it on first use. Processes that make
// it at once end up with the same one.
//
// Nothing if the file cannot be read or made, or is no regular file of the right size. A file
// that exists is never replaced: what was sealed under it would be lost.
std::optional<Key> loadKey(const std::string& directory);

}  // namespace zevocore
