#include "rules.h"

#include <arpa/inet.h>

#include <limits>

bool hasNul(const std::string& value) { return value.find('\0') != std::string::npos; }

std::string untilNul(const std::string& value) { return value.substr(0, value.find('\0')); }

std::string doubled(const std::string& value) {
  std::string result;
  for (const char c : untilNul(value)) result.append(c == '\'' ? 2 : 1, c);
  return result;
}

std::string refusalOf(const std::vector<std::string>& values) {
  for (const std::string& value : values)
    if (hasNul(value)) return "unrecognized token: \"'" + doubled(value) + "\"";
  return {};
}

bool fits(const std::string& text, std::size_t min, std::size_t max) {
  return text.size() >= min && text.size() <= max;
}

bool isAddress(const std::string& text) {
  const std::string address = untilNul(text);
  unsigned char bytes[sizeof(in6_addr)];
  return inet_pton(AF_INET, address.c_str(), bytes) == 1 ||
         inet_pton(AF_INET6, address.substr(0, address.find('%')).c_str(), bytes) == 1;
}

std::int64_t number(const std::string& text) {
  const bool negative = !text.empty() && text.front() == '-';
  const std::string digits = text.substr(negative ? 1 : 0);
  if (digits.empty() || digits.find_first_not_of("0123456789") != std::string::npos) return 0;
  constexpr auto kMax = std::numeric_limits<std::int64_t>::max();
  constexpr auto kMin = std::numeric_limits<std::int64_t>::min();
  std::uint64_t magnitude = 0;
  for (const char digit : digits) {
    const auto value = static_cast<std::uint64_t>(digit - '0');
    if (magnitude > (static_cast<std::uint64_t>(kMax) - value) / 10) return negative ? kMin : kMax;
    magnitude = magnitude * 10 + value;
  }
  return negative ? -static_cast<std::int64_t>(magnitude) : static_cast<std::int64_t>(magnitude);
}
