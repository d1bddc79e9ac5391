// Random bytes from the operating system.

#pragma once

#include <cstddef>

namespace ZEVOOAUTHSERVER {

// Fills all of the buffer, or returns false. Asks getrandom(), which needs neither a file nor a
// descriptor, and reads "/dev/urandom" where the kernel lacks or refuses the call.
bool fillWithRandomBytes(unsigned char* buffer, std::size_t size);

}  // namespace ZEVOOAUTHSERVER
