// The time, in the form that the stores keep.

#pragma once

#include <cstdint>
#include <ctime>

namespace authserver {

inline std::int64_t unixNow() { return std::time(nullptr); }  // seconds

}  // namespace authserver
