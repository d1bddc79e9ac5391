// Moments and lengths of time, for people. Moments are Unix seconds.

#pragma once

#include <cstdint>
#include <optional>
#include <string>

namespace oauthctl {

std::int64_t unixNow();

// The number that a stored text spells; nothing unless it is one from its first character to its
// last. Beyond 64 bits it reads as the nearest number that fits, as the library has it.
std::optional<std::int64_t> number(const std::string& text);

// "now", "in 9 min", "3 days ago"
std::string relativeTime(std::int64_t moment, std::int64_t now);
// "2026-11-21 09:30:00"; a moment that the calendar cannot hold comes as the number it is.
std::string localTime(std::int64_t moment);

// Seconds of "90s", "45m", "12h", "30d" or "2w", or of "0"; nothing for any other text.
std::optional<std::int64_t> duration(const std::string& text);
// "30 days", "1 h"
std::string lengthOfTime(std::int64_t seconds);

}  // namespace oauthctl
