// The settings of the settings file. All are integers of 32 bits.

#pragma once

#include <limits>

#include "oauth_names.h"

namespace ZEVOOAUTHSERVER {

// A value below the smallest is replaced by the fallback, which is the default; a value above the
// largest by the largest.
struct SettingRange {
  int fallback, smallest, largest;

  constexpr int inForce(int value) const {
    if (value < smallest) return fallback;
    return value > largest ? largest : value;
  }
};

inline constexpr SettingRange kLifetime{600, 1, std::numeric_limits<int>::max()};  // seconds
inline constexpr SettingRange kRowCeiling{1000, 1, 10'000};                        // rows
inline constexpr SettingRange kLevelMask{0, std::numeric_limits<int>::min(),
                                         std::numeric_limits<int>::max()};  // a sum of bits

struct Setting {
  const char* name;
  const char* bounds;  // what it bounds, as the settings page says it
  SettingRange range;
};

// In the order in which the operator's program shows them.
inline constexpr Setting kSettings[] = {
    {names::setting::kClientInfoMax, "rows of `oauth_clientInfo`", kRowCeiling},
    {names::setting::kGrantCodeMax, "rows of `oauth_grantCode`, expired ones included",
     kRowCeiling},
    {names::setting::kTokenMax, "rows of `oauth_token`, expired ones included", kRowCeiling},
    {names::setting::kLogMax, "rows of `oauth_log`; older ones are deleted", kRowCeiling},
    {names::setting::kGrantCodeExpired, "lifetime of a new code, seconds", kLifetime},
    {names::setting::kTokenExpired, "lifetime of a new access token, seconds", kLifetime},
    {names::setting::kLogLevel, "diagnostics, a sum of bits", kLevelMask},
};

}  // namespace ZEVOOAUTHSERVER
