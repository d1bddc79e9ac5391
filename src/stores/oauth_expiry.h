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

// Deletes every expired row of the store until stopped. A failed delete makes the result 0 and does
// not stop the sweep. Where the rows cannot be read, unread is the result.
template <class Store, class Stop>
int deleteExpired(Store& store, std::int64_t now, int unread, Stop stop) {
  Json::Value rows(Json::arrayValue);
  if (!store.Get(&rows)) return unread;
  int result = 1;
  for (const Json::Value& row : rows) {
    if (stop()) break;
    if (isExpired(row, now)) result &= store.Del(decimalValue(row[names::column::kId]));
  }
  return result;
}

// In one transaction, since a commit for every row would make the disk write four times for each.
// Where the disk has no room for all of it, the sweep starts again and commits row by row, which
// needs little room. A failed first read deletes nothing and counts as success.
template <class Store>
int purgeExpired(Store& store) {
  const std::int64_t now = unixNow();
  {
    Transaction transaction(store, &OAUTHDBBasic::DBCmd);
    const int result = deleteExpired(store, now, 1, [&] { return transaction.isLost(); });
    if (transaction.commit()) return result;
    // Another process held the file for too long, or the caller's transaction is gone: what was
    // deleted came back.
    if (!transaction.isLost() || transaction.isPart()) return 0;
  }
  return deleteExpired(store, now, 0, [] { return false; });
}

}  // namespace ZEVOOAUTHSERVER
