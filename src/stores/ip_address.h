// Addresses of callers, kept beside codes and tokens.

#pragma once

#include <string>

namespace ZEVOOAUTHSERVER {

// Why the text is not an IP address of version 4 or 6; empty if it is one, or if it is empty.
std::string addressError(const std::string& ip);

}  // namespace ZEVOOAUTHSERVER
