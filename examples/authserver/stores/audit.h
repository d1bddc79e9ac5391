// Lines for the operator in the library's audit log.

#pragma once

#include <string>

namespace authserver {

// Adds the client's address. Never refuses: a request does not fail for want of a log line.
void audit(const std::string& event);

// Somebody else's text in double quotes, short, without anything that a terminal or a page would
// take for more than text.
std::string quotedForLog(const std::string& text);

}  // namespace authserver
