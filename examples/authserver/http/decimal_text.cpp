#include "decimal_text.h"

#include <charconv>
#include <limits>

namespace authserver {

std::int64_t fromDecimal(const std::string& text) {
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
