// What the result of a store's operation means for the request: done, not there, or "try again".

#pragma once

#include <exception>

#include "oauth_db_basic.h"
#include "refusal.h"

namespace authserver {

// A table has no room, or could not be counted, which the stores report alike.
struct TableFull : std::exception {};

// Refuses the request, with "try again", if the store did not open. Without this look everything
// it is asked later would read as "not there".
void requireOpen(const ZEVOOAUTHSERVER::OAUTHDBBasic& store);

// Whether an operation's failure only means that there is no such row. Throws otherwise: the
// refusal "try again" for a busy database, TableFull, or the store's own words.
bool isJustMissing(const ZEVOOAUTHSERVER::OAUTHDBBasic& store);

// Runs one operation: true if it succeeded, false if there is no such row.
template <class Operation>
bool attempt(ZEVOOAUTHSERVER::OAUTHDBBasic& store, Operation operation) {
  // A success leaves an earlier error in place, and a missing row records none.
  store.SetErrCode(ZEVOOAUTHSERVER::kErrNone);
  return operation() || !isJustMissing(store);
}

// Runs an operation that adds a row; if the table is full, once more after makeRoom, and then
// refuses the request with "try again".
template <class Operation, class MakeRoom>
auto withRoom(Operation operation, MakeRoom makeRoom) -> decltype(operation()) try {
  try {
    return operation();
  } catch (const TableFull&) {
    makeRoom();
    return operation();
  }
} catch (const TableFull&) {
  throw temporarilyUnavailable();
}

}  // namespace authserver
