// Characters that end lines and move cursors: no name, password or header has any.

#pragma once

#include <algorithm>
#include <string>

namespace authserver {

inline bool hasControlCharacters(const std::string& text) {
  return std::any_of(text.begin(), text.end(), [](unsigned char c) { return c < ' ' || c == 127; });
}

}  // namespace authserver
