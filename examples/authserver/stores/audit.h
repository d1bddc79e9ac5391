// Lines for the operator in the library's audit log.

#pragma once

#include <string>

namespace authserver {

// Adds the client's address. If the log fails, the request goes on.
void audit(const std::string& event);

// Text from outside, shortened and in double quotes. Characters that a terminal or a web page could
// interpret are escaped.
std::string quotedForLog(const std::string& text);

}  // namespace authserver
