#include "human_time.h"

#include <charconv>
#include <ctime>
#include <limits>
#include <system_error>

namespace oauthctl {
namespace {

constexpr std::int64_t kMinute = 60, kHour = 60 * kMinute, kDay = 24 * kHour, kWeek = 7 * kDay,
                       kYear = 365 * kDay;

std::string days(std::int64_t count, const char* unit) {
  return std::to_string(count) + " " + unit + (count == 1 ? "" : "s");
}

}  // namespace

std::int64_t unixNow() { return static_cast<std::int64_t>(std::time(nullptr)); }

std::optional<std::int64_t> number(const std::string& text) {
  using Limits = std::numeric_limits<std::int64_t>;
  const char* const end = text.data() + text.size();
  std::int64_t value = 0;
  const auto [stop, error] = std::from_chars(text.data(), end, value);
  if (error == std::errc::invalid_argument || stop != end) return std::nullopt;
  if (error == std::errc::result_out_of_range)
    return text.front() == '-' ? Limits::min() : Limits::max();
  return value;
}

std::string lengthOfTime(std::int64_t seconds) {
  if (seconds >= 2 * kYear) return days(seconds / kYear, "year");
  if (seconds >= 2 * kDay || seconds == kDay) return days(seconds / kDay, "day");
  if (seconds >= 2 * kHour || seconds == kHour) return std::to_string(seconds / kHour) + " h";
  if (seconds >= kMinute) return std::to_string(seconds / kMinute) + " min";
  return std::to_string(seconds) + " s";
}

std::string relativeTime(std::int64_t moment, std::int64_t now) {
  if (moment == now) return "now";
  std::int64_t difference = 0;
  if (__builtin_sub_overflow(moment, now, &difference) ||
      difference == std::numeric_limits<std::int64_t>::min())
    difference = moment > now ? std::numeric_limits<std::int64_t>::max()
                              : -std::numeric_limits<std::int64_t>::max();
  return difference > 0 ? "in " + lengthOfTime(difference) : lengthOfTime(-difference) + " ago";
}

std::string localTime(std::int64_t moment) {
  const auto time = static_cast<std::time_t>(moment);
  std::tm parts = {};
  char text[64];
  if (time != moment || localtime_r(&time, &parts) == nullptr ||
      std::strftime(text, sizeof text, "%Y-%m-%d %H:%M:%S", &parts) == 0)
    return std::to_string(moment);
  return text;
}

std::optional<std::int64_t> duration(const std::string& text) {
  if (text == "0") return 0;
  if (text.size() < 2 || text.size() > 8) return std::nullopt;
  std::int64_t unit = 0;
  switch (text.back()) {
    case 's':
      unit = 1;
      break;
    case 'm':
      unit = kMinute;
      break;
    case 'h':
      unit = kHour;
      break;
    case 'd':
      unit = kDay;
      break;
    case 'w':
      unit = kWeek;
      break;
    default:
      return std::nullopt;
  }
  const std::optional<std::int64_t> count = number(text.substr(0, text.size() - 1));
  if (!count || *count < 0) return std::nullopt;
  return *count * unit;
}

}  // namespace oauthctl
