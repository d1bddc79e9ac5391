// Expiry of codes and tokens. Moments are Unix seconds in 64 bits, also where a long has 32.

#pragma once

#include <json/value.h>

#include <cstdint>
#include <ctime>
#include <string>

#include "decimal_text.h"
#include "oauth_names.h"
#include "oauth_transaction.h"

namespace ZEVOOAUTHSERVER {

inline std::int64_t unixNow() { return static_cast<std::int64_t>(std::time(nullptr)); }

// Still valid during the very second that the row's expiry names.
inline bool isExpired(const Json::Value& row, std::int64_t now) {
  return now > decimalValue(row[names::column::kExpiredTime]);
}

// Deletes every expired row of the store; a failed delete makes the result 0 and does not stop
// the sweep. A failed read deletes nothing and counts as success. One transaction, since a commit
// for every row would make the disk write four times for each; where none can begin, row by row.
template <class Store>
int purgeExpired(Store& store) {
  const std::int64_t now = unixNow();
  Transaction transaction(store, &OAUTHDBBasic::DBCmd);
  Json::Value rows(Json::arrayValue);
  if (!store.Get(&rows)) return 1;
  int result = 1;
  for (const Json::Value& row : rows)
    if (isExpired(row, now)) result &= store.Del(decimalValue(row[names::column::kId]));
  return transaction.commit() ? result : 0;
}

}  // namespace ZEVOOAUTHSERVER
