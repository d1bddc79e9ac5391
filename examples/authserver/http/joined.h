// A list of words as one text.

#pragma once

#include <string>
#include <vector>

namespace authserver {

// "GET, HEAD" from {"GET", "HEAD"} and ", "
inline std::string joined(const std::vector<std::string>& words, const std::string& separator) {
  std::string result;
  for (const std::string& word : words) result += (result.empty() ? "" : separator) + word;
  return result;
}

}  // namespace authserver
