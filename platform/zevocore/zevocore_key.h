// The key of the encryption stand-in: 64 random bytes in a file of mode 0600.

#pragma once

#include <optional>
#include <string>

#include "zevocore_siv.h"

namespace zevocore {

// Reads the key from "zevocore.key" in the directory, and makes the file on first use. Processes
// that make it at the same time get the same key.
//
// Returns nothing if the file cannot be read or made, or is not a regular file of the right size.
// An existing file is never replaced, because everything sealed with its key would be lost.
std::optional<Key> loadKey(const std::string& directory);

}  // namespace zevocore
