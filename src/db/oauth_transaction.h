// A transaction of a store's connection, rolled back unless it is committed. Inside a transaction
// that the caller has begun it is a part of that one, which the caller commits.

#pragma once

#include <sqlite3.h>

#include "oauth_db_basic.h"

namespace ZEVOOAUTHSERVER {

class Transaction {
 public:
  // How its statements are run: OAUTHDBBasic::DBCmd, or DBCmdRun while the store is made ready.
  using Runner = bool (OAUTHDBBasic::*)(const std::string& sql, OAUTHDBBasic::RowCallback callback,
                                        Json::Value* result);

  // Takes the write lock at once: a transaction that began by reading and then wants to write
  // fails without waiting while another one does the same. Where it cannot begin, statements are
  // committed one by one. On a store that is not ready nothing is tried, since whatever comes
  // next is refused with the same line.
  Transaction(OAUTHDBBasic& store, Runner run) : store_(store), run_(run) {
    if (run_ == &OAUTHDBBasic::DBCmd && !store_.ready_) return;
    isPart_ = isUnderWay();
    begun_ = execute(isPart_ ? "SAVEPOINT zevooauth;" : "BEGIN IMMEDIATE;");
  }
  ~Transaction() {
    try {
      rollBack();
    } catch (...) {  // out of memory: closing the connection rolls back too
    }
  }
  Transaction(const Transaction&) = delete;
  Transaction& operator=(const Transaction&) = delete;

  bool begun() const { return begun_; }

  // It cannot be committed whole: SQLite rolled everything back by itself after an error, or the
  // disk has no room for the last statement, which SQLite then undoes alone on a table with
  // triggers.
  bool isLost() const {
    const bool isFull = !isPart_ && (sqlite3_errcode(store_.db_) & 0xFF) == SQLITE_FULL;
    return begun_ && (isFull || !isUnderWay());
  }

  // The caller has begun it.
  bool isPart() const { return isPart_; }

  // True if the changes are kept. Where no transaction could begin, each was committed already.
  bool commit() {
    if (!begun_) return true;
    if (!isLost() && execute(isPart_ ? "RELEASE zevooauth;" : "COMMIT;")) {
      begun_ = false;
      return true;
    }
    if (!isLost()) rollBack();
    return false;
  }

 private:
  bool isUnderWay() const { return sqlite3_get_autocommit(store_.db_) == 0; }
  bool execute(const char* sql) { return (store_.*run_)(sql, nullptr, nullptr); }
  void rollBack() {
    if (begun_ && isUnderWay())
      execute(isPart_ ? "ROLLBACK TO zevooauth; RELEASE zevooauth;" : "ROLLBACK;");
    begun_ = false;
  }

  OAUTHDBBasic& store_;
  const Runner run_;
  bool isPart_ = false, begun_ = false;
};

}  // namespace ZEVOOAUTHSERVER
