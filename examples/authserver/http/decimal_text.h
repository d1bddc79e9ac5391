// Numbers as decimal text, as requests, rows and cookies hold them.

#pragma once

#include <cstdint>
#include <string>

namespace authserver {

// 0 if the text is not a whole number. A number beyond 64 bits becomes the nearest one that fits,
// as in the library: an expiry in the far future is not in the past.
std::int64_t fromDecimal(const std::string& text);

}  // namespace authserver
