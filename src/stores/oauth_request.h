// What every store does with its arguments: check lengths, build requests, read row ids.

#pragma once

#include <json/value.h>

#include <initializer_list>
#include <string>
#include <utility>

#include "decimal_text.h"
#include "oauth_names.h"
#include "oauth_utils.h"

namespace ZEVOOAUTHSERVER {

// Bytes, both inclusive.
struct Limit {
  int min, max;
};
inline constexpr Limit kUserNameLimit{1, 256};
inline constexpr Limit kClientIdLimit{64, 64};
inline constexpr Limit kClientSecretLimit{64, 64};
inline constexpr Limit kRedirectUriLimit{3, 2048};
inline constexpr Limit kScopeLimit{1, 2048};
inline constexpr Limit kDisplayNameLimit{1, 64};
inline constexpr Limit kCodeLimit{64, 64};
inline constexpr Limit kTokenLimit{64, 64};
inline constexpr Limit kExpiredTimeLimit{1, 128};
inline constexpr Limit kFlowTypeLimit{1, 32};
inline constexpr Limit kStateLimit{1, 2048};

struct Field {
  const std::string& value;
  Limit limit;
};

// Checks in the order given and stops at the first misfit.
inline bool fit(std::initializer_list<Field> fields) {
  for (const Field& field : fields)
    if (!checkStrLen(field.value, field.limit.min, field.limit.max, false)) return false;
  return true;
}

inline Json::Value where(const char* column, Json::Value value) {
  Json::Value request;
  request[names::request::kCondition][column] = std::move(value);
  return request;
}

inline Json::Value whereId(long long id) {
  return where(names::column::kId, static_cast<Json::Int64>(id));
}

// Row id of the first row, its low 32 bits; 0 if there is none.
inline int firstId(const Json::Value& rows) {
  if (rows.empty()) return 0;
  return static_cast<int>(decimalValue(rows[0U][names::column::kId]));
}

}  // namespace ZEVOOAUTHSERVER
