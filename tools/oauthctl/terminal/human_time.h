// Moments and lengths of time as people write them. Moments are Unix seconds.

#pragma once

#include <cstdint>
#include <optional>
#include <string>

namespace oauthctl {

// "now", "in 9 min", "3 days ago"
std::string relativeTime(std::int64_t moment, std::int64_t now);
// "2026-11-21 09:30:00"; a moment that the calendar cannot hold becomes its number.
std::string localTime(std::int64_t moment);

// The seconds in "90s", "45m", "12h", "30d", "2w" or "0"; nothing for any other text.
std::optional<std::int64_t> duration(const std::string& text);
// "30 days", "1 h"
std::string lengthOfTime(std::int64_t seconds);

}  // namespace oauthctl
