// What the result of a store's operation means for the request: success, no such row, or "try
// again".

#pragma once

#include <exception>

#include "oauth_db_basic.h"
#include "refusal.h"

namespace authserver {

// Thrown if a table is full or could not be counted. The stores report the same error for both.
struct TableFull : std::exception {};

// Refuses the request with "try again" if the store did not open. Without this check, the results
// of its operations would look like "no such row".
void requireOpen(const ZEVOOAUTHSERVER::OAUTHDBBasic& store);

// True if an operation failed only because there is no such row. Otherwise throws the refusal "try
// again" for a busy database, TableFull, or an error with the store's message.
bool isMissingRow(const ZEVOOAUTHSERVER::OAUTHDBBasic& store);

// Runs one operation: true if it succeeded, false if there is no such row.
template <class Operation>
bool attempt(ZEVOOAUTHSERVER::OAUTHDBBasic& store, Operation operation) {
  // A success leaves an earlier error in place, and a missing row records none.
  store.SetErrCode(ZEVOOAUTHSERVER::kErrNone);
  return operation() || !isMissingRow(store);
}

// Runs an operation that adds a row. If the table is full, calls makeRoom and runs the operation
// once more. If the table is still full, refuses the request with "try again".
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
