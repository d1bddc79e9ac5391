// Reading the rows of the stores.

#pragma once

#include <json/value.h>

#include <cstdint>
#include <string>

namespace authserver {

// The text as it was once given. The stores double a single quote before they quote the value for
// SQL, which doubles it again, so that it comes back doubled. Every text of a row is read by this.
std::string storedText(const Json::Value& row, const char* column);

// A number, which rows hold as decimal text; 0 if it is none, and the nearest that fits if it is
// beyond 64 bits, as the library reads it: an expiry in the far future is not in the past.
std::int64_t storedNumber(const Json::Value& row, const char* column);

}  // namespace authserver
