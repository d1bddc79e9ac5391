// The encoding of web forms and queries, application/x-www-form-urlencoded.

#pragma once

#include <optional>
#include <string>
#include <utility>
#include <vector>

namespace authserver {

using Fields = std::vector<std::pair<std::string, std::string>>;

// "a=1&b=x%20y"
std::string formEncoded(const Fields& fields);

// The value behind one encoded text; nothing if two hexadecimal digits do not follow a percent
// sign.
std::optional<std::string> formDecoded(const std::string& text);

}  // namespace authserver
