// Several operations of one store as one: all of them happen, or none.

#pragma once

#include "store_errors.h"

namespace authserver {

// Takes the database's write lock at once and rolls back unless it is committed.
//
// Spending needs it: stores delete by row id, and the id of a deleted row may be given to the next
// new one. Without the lock a program that found a code, and was overtaken by another that spent
// it, could delete the code of somebody else and take its own for spent by itself.
//
// Nothing but this store may write meanwhile. Its Purge() becomes a part of the transaction.
class Transaction {
 public:
  explicit Transaction(ZEVOOAUTHSERVER::OAUTHDBBasic& store) : store_(store) {
    open_ = run("BEGIN IMMEDIATE;");
  }
  ~Transaction() { rollBack(); }
  Transaction(const Transaction&) = delete;
  Transaction& operator=(const Transaction&) = delete;

  void commit() { open_ = !run("COMMIT;"); }
  void rollBack() {
    if (open_) store_.DBCmd("ROLLBACK;", nullptr, nullptr);
    open_ = false;
  }

 private:
  bool run(const char* sql) {
    return attempt(store_, [&] { return store_.DBCmd(sql, nullptr, nullptr); });
  }

  ZEVOOAUTHSERVER::OAUTHDBBasic& store_;
  bool open_;
};

}  // namespace authserver
