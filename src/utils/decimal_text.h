// Rows hold their numbers as decimal text, which the JSON library's own accessors refuse.

#pragma once

#include <json/value.h>

#include <charconv>
#include <cstdint>
#include <limits>
#include <optional>
#include <string>
#include <system_error>

namespace ZEVOOAUTHSERVER {

// The number that the text spells from its first byte to its last; nothing if it is no decimal
// number. A number beyond 64 bits becomes the nearest one that fits, so that comparing it with the
// clock still tells the truth.
inline std::optional<std::int64_t> decimalNumber(const std::string& text) {
  const char* const end = text.data() + text.size();
  std::int64_t number = 0;
  const auto [stop, error] = std::from_chars(text.data(), end, number);
  if (error == std::errc::invalid_argument || stop != end) return std::nullopt;
  if (error == std::errc::result_out_of_range)
    return text.front() == '-' ? std::numeric_limits<std::int64_t>::min()
                               : std::numeric_limits<std::int64_t>::max();
  return number;
}

// The number in a row's member. Null, and text that is no decimal number, reads as 0.
inline std::int64_t decimalValue(const Json::Value& member) {
  return decimalNumber(member.asString()).value_or(0);
}

}  // namespace ZEVOOAUTHSERVER
