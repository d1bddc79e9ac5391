// Whether the contents of a database are what this system writes.

#pragma once

#include "finding.h"
#include "sqlite_connection.h"

namespace oauthctl {

// Pages, table definitions, schema versions: what a file must have to be our database at all.
Findings checkStructure(SqliteConnection& database);

// The journal is the library's own kind.
Findings checkJournalMode(SqliteConnection& database);

struct CipherCount {
  int values = 0, unreadable = 0;
};

// Every encrypted value decrypts.
Findings checkCiphers(SqliteConnection& database, CipherCount& count);
// Every expiry is a number.
Findings checkExpiries(SqliteConnection& database);

}  // namespace oauthctl
