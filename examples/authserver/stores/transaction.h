// Several operations of one store: all of them take effect, or none.

#pragma once

#include "store_errors.h"

namespace authserver {

// Takes the write lock of the database at once. Rolls back unless it is committed.
//
// Whoever spends a code or a refresh token needs it. Stores delete by row id, and a new row may get
// the id of a deleted one. Without the lock, another program could spend a code after this one
// found it; this one would then delete somebody else's code and believe that it had spent its own.
//
// Only this store may write meanwhile. Its Purge() becomes a part of the transaction.
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
