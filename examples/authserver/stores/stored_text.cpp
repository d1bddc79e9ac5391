#include "stored_text.h"

#include <charconv>
#include <limits>

namespace authserver {

std::string storedText(const Json::Value& row, const char* column) {
  std::string text = row[column].asString();
  for (std::size_t at = 0; (at = text.find("''", at)) != std::string::npos; ++at) text.erase(at, 1);
  return text;
}

std::int64_t storedNumber(const Json::Value& row, const char* column) {
  const std::string text = row[column].asString();
  const char* const end = text.data() + text.size();
  std::int64_t number = 0;
  const auto [stop, error] = std::from_chars(text.data(), end, number);
  if (error == std::errc::invalid_argument || stop != end) return 0;
  using Limits = std::numeric_limits<std::int64_t>;
  if (error == std::errc::result_out_of_range)
    return text.front() == '-' ? Limits::min() : Limits::max();
  return number;
}

}  // namespace authserver
