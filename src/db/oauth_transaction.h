// A transaction of a store's connection.

#pragma once

#include <sqlite3.h>

#include "oauth_db_basic.h"

namespace ZEVOOAUTHSERVER {

// It is rolled back unless it is committed. Inside a transaction that the caller has begun it is a
// part of that one: the caller then commits or rolls back the whole.
class Transaction {
 public:
  // For operations on records. On a store that is not ready nothing is begun: the operation's own
  // statement is refused with the same line.
  static Transaction onReadyStore(OAUTHDBBasic& store) { return {store, true}; }
  // For making the schema, which happens before the store is ready.
  static Transaction whileMakingReady(OAUTHDBBasic& store) { return {store, false}; }
  ~Transaction() {
    try {
      rollBack();
    } catch (...) {  // out of memory: closing the connection rolls back too
    }
  }
  Transaction(const Transaction&) = delete;
  Transaction& operator=(const Transaction&) = delete;

  bool begun() const { return begun_; }

  // True if it cannot be committed whole. Either SQLite rolled everything back by itself after an
  // error, or the disk has no room for the last statement. (On a table with triggers SQLite undoes
  // that statement alone.)
  bool isLost() const {
    const bool isFull = !isPart_ && (sqlite3_errcode(store_.db_) & 0xFF) == SQLITE_FULL;
    return begun_ && (isFull || !isUnderWay());
  }

  // True if the caller had begun a transaction before.
  bool isPart() const { return isPart_; }

  // True if the changes are kept. If no transaction could begin, each statement was committed by
  // itself and there is nothing left to do.
  bool commitIfBegun() {
    if (!begun_) return true;
    if (!isLost() && execute(isPart_ ? "RELEASE zevooauth;" : "COMMIT;")) {
      begun_ = false;
      return true;
    }
    if (!isLost()) rollBack();
    return false;
  }

 private:
  // Takes the write lock at once: a transaction that began by reading and then wants to write
  // fails without waiting while another one does the same. If it cannot begin, statements are
  // committed one by one.
  Transaction(OAUTHDBBasic& store, bool mustBeReady) : store_(store), mustBeReady_(mustBeReady) {
    if (mustBeReady_ && !store_.ready_) return;
    isPart_ = isUnderWay();
    begun_ = execute(isPart_ ? "SAVEPOINT zevooauth;" : "BEGIN IMMEDIATE;");
  }

  bool isUnderWay() const { return sqlite3_get_autocommit(store_.db_) == 0; }
  bool execute(const char* sql) {
    return mustBeReady_ ? store_.DBCmd(sql, nullptr, nullptr)
                        : store_.DBCmdRun(sql, nullptr, nullptr);
  }
  void rollBack() {
    if (begun_ && isUnderWay())
      execute(isPart_ ? "ROLLBACK TO zevooauth; RELEASE zevooauth;" : "ROLLBACK;");
    begun_ = false;
  }

  OAUTHDBBasic& store_;
  const bool mustBeReady_;
  bool isPart_ = false, begun_ = false;
};

}  // namespace ZEVOOAUTHSERVER
