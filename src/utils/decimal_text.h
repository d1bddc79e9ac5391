// Rows hold their numbers as decimal text, which the JSON library's own accessors refuse.

#pragma once

#include <json/value.h>

#include <charconv>
#include <cstdint>
#include <limits>
#include <string>
#include <system_error>

namespace ZEVOOAUTHSERVER {

// The number that a row's string spells. Null, and text that is no decimal number from its first
// byte to its last, read as 0; a number beyond 64 bits reads as the nearest one that fits, so
// that comparing it with the clock still tells the truth.
inline std::int64_t decimalValue(const Json::Value& value) {
  const std::string text = value.asString();
  const char* const end = text.data() + text.size();
  std::int64_t number = 0;
  const auto [stop, error] = std::from_chars(text.data(), end, number);
  if (error == std::errc::invalid_argument || stop != end) return 0;
  if (error == std::errc::result_out_of_range)
    return text.front() == '-' ? std::numeric_limits<std::int64_t>::min()
                               : std::numeric_limits<std::int64_t>::max();
  return number;
}

}  // namespace ZEVOOAUTHSERVER
