// Checks that the contents of a database are what the library writes.

#pragma once

#include "checks/finding.h"
#include "database/sqlite_connection.h"

namespace oauthctl {

// Checks pages, table definitions and schema versions: without them a file is not our database.
Findings checkStructure(SqliteConnection& database);

// Checks that the journal mode is the one that the library uses.
Findings checkJournalMode(SqliteConnection& database);

struct CipherCount {
  int values = 0, unreadable = 0;
};

// Checks that every encrypted value decrypts, and adds to the count.
Findings checkCiphers(SqliteConnection& database, CipherCount& count);
// Checks that every expiry is a number.
Findings checkExpiries(SqliteConnection& database);

}  // namespace oauthctl
