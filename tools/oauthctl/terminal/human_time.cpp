#include "terminal/human_time.h"

#include <ctime>
#include <limits>

#include "decimal_text.h"

namespace oauthctl {
namespace {

constexpr std::int64_t kMinute = 60, kHour = 60 * kMinute, kDay = 24 * kHour, kWeek = 7 * kDay,
                       kYear = 365 * kDay;

std::string countOf(std::int64_t count, const char* unit) {
  return std::to_string(count) + " " + unit + (count == 1 ? "" : "s");
}

// 0 if there is no such unit.
std::int64_t secondsOfUnit(char unit) {
  switch (unit) {
    case 's':
      return 1;
    case 'm':
      return kMinute;
    case 'h':
      return kHour;
    case 'd':
      return kDay;
    case 'w':
      return kWeek;
    default:
      return 0;
  }
}

}  // namespace

std::string lengthOfTime(std::int64_t seconds) {
  if (seconds >= 2 * kYear) return countOf(seconds / kYear, "year");
  if (seconds >= 2 * kDay || seconds == kDay) return countOf(seconds / kDay, "day");
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
  const std::int64_t unit = secondsOfUnit(text.back());
  const auto count = ZEVOOAUTHSERVER::decimalNumber(text.substr(0, text.size() - 1));
  if (unit == 0 || !count || *count < 0) return std::nullopt;
  return *count * unit;
}

}  // namespace oauthctl
