// The clock. Moments are Unix seconds in 64 bits, also where a long has 32.

#pragma once

#include <cstdint>
#include <ctime>

namespace ZEVOOAUTHSERVER {

inline std::int64_t unixNow() { return static_cast<std::int64_t>(std::time(nullptr)); }

}  // namespace ZEVOOAUTHSERVER
