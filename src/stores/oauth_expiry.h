// Expiry of codes and tokens.

#pragma once

#include <json/value.h>

#include <cstdint>
#include <string>

#include "decimal_text.h"
#include "oauth_names.h"
#include "oauth_transaction.h"
#include "unix_time.h"

namespace ZEVOOAUTHSERVER {

// A row is still valid during the second that its expiry names.
inline bool isExpired(const Json::Value& row, std::int64_t now) {
  return now > decimalValue(row[names::column::kExpiredTime]);
}

// Deletes the store's expired rows until stop() is true. A failed delete makes the result 0 and
// does not end the sweep. If the rows cannot be read, the result is ifUnread.
template <class Store, class Stop>
int deleteExpired(Store& store, std::int64_t now, int ifUnread, Stop stop) {
  Json::Value rows(Json::arrayValue);
  if (!store.Get(&rows)) return ifUnread;
  int result = 1;
  for (const Json::Value& row : rows) {
    if (stop()) break;
    if (isExpired(row, now)) result &= store.Del(decimalValue(row[names::column::kId]));
  }
  return result;
}

// Purge() of codes and tokens, in one transaction: with a commit for each row the disk would write
// four times for each row. If the disk has no room for the whole, the sweep starts again and
// commits row by row, which needs little room. A failed first read deletes nothing and counts as
// success.
template <class Store>
int purgeExpired(Store& store) {
  const std::int64_t now = unixNow();
  {
    Transaction transaction = Transaction::onReadyStore(store);
    const int result = deleteExpired(store, now, 1, [&] { return transaction.isLost(); });
    if (transaction.commitIfBegun()) return result;
    // The deleted rows are back: another process held the file for too long, or SQLite ended the
    // caller's transaction.
    if (!transaction.isLost() || transaction.isPart()) return 0;
  }
  return deleteExpired(store, now, 0, [] { return false; });
}

}  // namespace ZEVOOAUTHSERVER
