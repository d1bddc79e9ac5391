// Characters that end lines or move cursors. Names, passwords and headers have none.

#pragma once

#include <algorithm>
#include <string>

namespace authserver {

inline bool hasControlCharacters(const std::string& text) {
  return std::any_of(text.begin(), text.end(), [](unsigned char c) { return c < ' ' || c == 127; });
}

}  // namespace authserver
