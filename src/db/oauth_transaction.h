// A transaction of a store's connection, rolled back unless it is committed.

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
    const bool refused = run_ == &OAUTHDBBasic::DBCmd && !store_.ready_;
    begun_ = !refused && (store_.*run_)("BEGIN IMMEDIATE;", nullptr, nullptr);
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

  // True also if there is nothing to commit: it never began, or SQLite rolled it back by itself
  // after an error, which was reported then.
  bool commit() {
    if (!isOpen() || (store_.*run_)("COMMIT;", nullptr, nullptr)) return true;
    rollBack();
    return false;
  }

 private:
  bool isOpen() const { return begun_ && sqlite3_get_autocommit(store_.db_) == 0; }
  void rollBack() {
    if (isOpen()) (store_.*run_)("ROLLBACK;", nullptr, nullptr);
    begun_ = false;
  }

  OAUTHDBBasic& store_;
  const Runner run_;
  bool begun_;
};

}  // namespace ZEVOOAUTHSERVER
