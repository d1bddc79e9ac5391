#include "stored_text.h"

#include <charconv>

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
  return error == std::errc() && stop == end ? number : 0;
}

}  // namespace authserver
