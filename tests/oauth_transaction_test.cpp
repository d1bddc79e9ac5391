// Transactions of the library: the first creation of the database, and the deletion of expired
// codes and tokens.

#include "oauth_transaction.h"

#include <filesystem>
#include <memory>

#include "faulty_disk.h"
#include "oauth_grantCode.h"
#include "oauth_token.h"
#include "store_test.h"

using testing::ElementsAre;
using testing::IsEmpty;
using testing::StartsWith;
using ZEVOOAUTHSERVER::OAUTHDBBasic;
using ZEVOOAUTHSERVER::OAUTHDBGrantCode;
using ZEVOOAUTHSERVER::OAUTHDBToken;

namespace {

// Another process's connection, with locks that it holds.
class OtherConnection {
 public:
  OtherConnection(const std::string& path, const std::string& sql) {
    sqlite3* db = nullptr;
    const int opened = sqlite3_open_v2(path.c_str(), &db, SQLITE_OPEN_READWRITE, nullptr);
    db_.reset(db);
    if (opened != SQLITE_OK ||
        sqlite3_exec(db, sql.c_str(), nullptr, nullptr, nullptr) != SQLITE_OK)
      throw std::runtime_error(sqlite3_errmsg(db));
  }

 private:
  struct Close {
    void operator()(sqlite3* db) const { sqlite3_close_v2(db); }
  };
  std::unique_ptr<sqlite3, Close> db_;
};

class TransactionTest : public StoreTest {
 protected:
  // Number of transactions that ever wrote to the file: its change counter, 4 bytes big-endian.
  unsigned commits() const {
    unsigned count = 0;
    for (const char byte : databaseBytes().substr(24, 4))
      count = count * 256 + static_cast<unsigned char>(byte);
    return count;
  }
};

// --- First creation ---

class FirstCreationTest : public TransactionTest {};

TEST_F(FirstCreationTest, CommitsMetaTableWithItsRowsAtOnce) {
  { const OAUTHDBBasic store; }
  EXPECT_EQ(5U, commits());  // meta with three rows, then four tables
  EXPECT_EQ(3, rowCount("oauth_meta"));
}

TEST_F(FirstCreationTest, FailsWhileAnotherProcessWrites) {
  execute("CREATE TABLE t(a)");
  const OtherConnection other(files_.database(), "BEGIN IMMEDIATE");
  const OAUTHDBBasic store;
  expectError(store, -1, "Create table failed");
  EXPECT_THAT(log_.lines(),
              ElementsAre("3 oauth_db_basic.cpp Run Command failed!![database is locked][5]",
                          "3 oauth_db_basic.cpp Create Table failed!![meta]"));
}

TEST_F(FirstCreationTest, LeavesVersionRowsOfAnExistingFileAlone) {
  execute("CREATE TABLE oauth_meta(tab_name text NOT NULL, version integer NOT NULL)");
  { const OAUTHDBBasic store; }
  EXPECT_EQ(0, rowCount("oauth_meta"));
  execute("INSERT INTO oauth_meta VALUES('oauth_token', 2), ('oauth_token', 2)");
  { const OAUTHDBBasic store; }
  EXPECT_EQ(2, rowCount("oauth_meta"));
}

TEST_F(FirstCreationTest, SaysWhyWhenVersionRowsVanishWithoutAnError) {
  execute(
      "CREATE VIEW oauth_meta AS SELECT 1 AS tab_name, 2 AS version;"
      "CREATE TRIGGER t INSTEAD OF INSERT ON oauth_meta BEGIN SELECT 1; END");
  OAUTHDBBasic store;
  expectError(store, -1, "Create table failed");
  EXPECT_FALSE(store.DBCmd("SELECT 1;", nullptr, nullptr));
  EXPECT_THAT(log_.lines(), ElementsAre("3 oauth_db_basic.cpp Create Table failed!![meta]",
                                        "3 oauth_db_basic.cpp DB is not ready!!"));
}

TEST_F(FirstCreationTest, LogsTheFailedTableWhereverTheDiskIsFull) {
  const FaultyDisk disk;
  int failures = 0;
  for (;; ++failures) {
    SCOPED_TRACE(failures);
    std::filesystem::remove(files_.database());
    std::filesystem::remove(files_.database() + "-journal");
    log_.clear();
    FaultyDisk::fillAfter(failures);
    const OAUTHDBBasic store;
    if (!FaultyDisk::mend()) break;
    expectError(store, -1, "Create table failed");
    EXPECT_THAT(log_.lines().back(), StartsWith("3 oauth_db_basic.cpp Create Table failed!!["));
  }
  EXPECT_GT(failures, 10);
  EXPECT_EQ(3, rowCount("oauth_meta"));
}

// --- First creation inside the caller's transaction ---

class JoinedCreationTest : public FirstCreationTest {
 protected:
  JoinedCreationTest() {
    EXPECT_TRUE(store_.DBCmd("BEGIN; DROP TABLE oauth_meta;", nullptr, nullptr));
  }
  OAUTHDBBasic store_;
};

TEST_F(JoinedCreationTest, IsAPartOfIt) {
  EXPECT_TRUE(store_.DBInit());
  EXPECT_TRUE(store_.DBCmd("COMMIT;", nullptr, nullptr));
  EXPECT_EQ(3, rowCount("oauth_meta"));
  expectError(store_, 255, "");
  EXPECT_THAT(log_.lines(), IsEmpty());
}

TEST_F(JoinedCreationTest, IsRolledBackWithIt) {
  EXPECT_TRUE(store_.DBInit());
  execute("PRAGMA user_version");  // nothing of it is visible yet
  EXPECT_TRUE(store_.DBCmd("DROP TABLE oauth_meta; ROLLBACK;", nullptr, nullptr));
  EXPECT_EQ(3, rowCount("oauth_meta"));
  expectError(store_, 255, "");
}

TEST_F(JoinedCreationTest, LeavesTheCallersChangesAloneWhenItFails) {
  EXPECT_TRUE(
      store_.DBCmd("CREATE VIEW oauth_meta AS SELECT 1 AS tab_name, 2 AS version;"
                   "INSERT INTO oauth_log VALUES(1, 'kept', 1);",
                   nullptr, nullptr));
  EXPECT_TRUE(store_.DBInit());  // tells whether the store is ready, and it was already
  expectError(store_, -1, "Create table failed");
  EXPECT_TRUE(store_.DBCmd("COMMIT;", nullptr, nullptr));
  EXPECT_THAT(query("SELECT msg FROM oauth_log"), ElementsAre("kept"));
}

// --- Sweep ---

template <class Store>
struct Name;
template <>
struct Name<OAUTHDBGrantCode> {
  static constexpr char table[] = "oauth_grantCode";
  static constexpr char values[] = "(username, client_id, scope, code, expired_time, state, id)";
};
template <>
struct Name<OAUTHDBToken> {
  static constexpr char table[] = "oauth_token";
  static constexpr char values[] =
      "(username, client_id, scope, access_token, expired_time, state, id, refresh_token, "
      "flow_type)";
};

template <class Store>
class SweepTest : public TransactionTest {
 protected:
  SweepTest() {
    const Store store(table_);
    log_.clear();
  }

  void insert(int id, const std::string& expiry) const {
    const std::string number = std::to_string(id);
    const bool token = table_ == "oauth_token";
    execute("INSERT INTO " + table_ + Name<Store>::values +
            " VALUES('alice', 'sealed:c', 'read', '" + number + "', '" + expiry + "', 'xyz', " +
            number + (token ? ", 'r', 'code')" : ")"));
  }
  void insertExpired(int count) const {
    for (int id = 1; id <= count; ++id) insert(id, "1");
  }
  // 200 expired rows of 2000 bytes each: their pages do not fit into the journal.
  static constexpr int kJournalRoom = 128 * 1024;
  void insertMoreThanTheJournalHolds() const {
    insertExpired(200);
    execute("UPDATE " + table_ + " SET state = hex(zeroblob(1000))");
  }
  void onDeleteOf(int id, const std::string& action) const {
    execute("CREATE TRIGGER t BEFORE DELETE ON " + table_ + " WHEN old.id = " + std::to_string(id) +
            " BEGIN SELECT RAISE(" + action + "); END");
  }
  Lines ids() const { return query("SELECT id FROM " + table_ + " ORDER BY id"); }

  const std::string table_ = Name<Store>::table;
};

using SweepingStores = testing::Types<OAUTHDBGrantCode, OAUTHDBToken>;
TYPED_TEST_SUITE(SweepTest, SweepingStores);

TYPED_TEST(SweepTest, IsOneCommit) {
  this->insertExpired(20);
  this->insert(21, "1700000000");
  const unsigned before = this->commits();
  EXPECT_EQ(1, TypeParam(this->table_).Purge());
  EXPECT_EQ(before + 1, this->commits());
  EXPECT_THAT(this->ids(), ElementsAre("21"));
  EXPECT_THAT(this->log_.lines(), IsEmpty());
}

TYPED_TEST(SweepTest, WritesNothingIfNothingHasExpired) {
  this->insert(1, "1700000000");
  const std::string before = this->databaseBytes();
  EXPECT_EQ(1, TypeParam(this->table_).Purge());
  EXPECT_EQ(before, this->databaseBytes());
}

TYPED_TEST(SweepTest, CommitsTheOtherRowsAfterAFailedDelete) {
  this->insertExpired(3);
  this->onDeleteOf(2, "ABORT, 'kept'");
  EXPECT_EQ(0, TypeParam(this->table_).Purge());
  EXPECT_THAT(this->ids(), ElementsAre("2"));
  EXPECT_THAT(this->log_.lines(),
              ElementsAre("3 oauth_db_basic.cpp Run Command failed!![kept][19]",
                          "3 oauth_db_basic.cpp Delete failed[" + this->table_ + "]"));
}

// The error rolls back the deletes before it. The sweep starts again and commits row by row.
TYPED_TEST(SweepTest, StartsAgainRowByRowWhenSqliteEndsTheTransaction) {
  this->insertExpired(4);
  this->onDeleteOf(2, "ROLLBACK, 'all back'");
  TypeParam store(this->table_);
  const unsigned before = this->commits();
  EXPECT_EQ(0, store.Purge());
  EXPECT_THAT(this->ids(), ElementsAre("2"));
  EXPECT_EQ(before + 3, this->commits());
  this->expectError(store, 19, "all back");
  const std::string error = "3 oauth_db_basic.cpp Run Command failed!![all back][19]";
  const std::string failed = "3 oauth_db_basic.cpp Delete failed[" + this->table_ + "]";
  EXPECT_THAT(this->log_.lines(), ElementsAre(error, failed, error, failed));
}

TYPED_TEST(SweepTest, NeedsLittleRoomOnTheDisk) {
  const FaultyDisk disk;
  this->insertMoreThanTheJournalHolds();
  TypeParam store(this->table_);
  FaultyDisk::limitJournal(this->kJournalRoom);
  EXPECT_EQ(1, store.Purge());
  EXPECT_TRUE(FaultyDisk::mend());
  EXPECT_THAT(this->ids(), IsEmpty());
  this->expectError(store, 13, "database or disk is full");
  EXPECT_THAT(this->log_.lines(),
              ElementsAre("3 oauth_db_basic.cpp Run Command failed!![database or disk is full][13]",
                          "3 oauth_db_basic.cpp Delete failed[" + this->table_ + "]"));
}

// SQLite then undoes the last statement alone and leaves the transaction open.
TYPED_TEST(SweepTest, NeedsLittleRoomOnTheDiskBesideATrigger) {
  const FaultyDisk disk;
  this->insertMoreThanTheJournalHolds();
  this->onDeleteOf(0, "ABORT, 'never'");
  TypeParam store(this->table_);
  FaultyDisk::limitJournal(this->kJournalRoom);
  EXPECT_EQ(1, store.Purge());
  EXPECT_TRUE(FaultyDisk::mend());
  EXPECT_THAT(this->ids(), IsEmpty());
  this->expectError(store, 13, "database or disk is full");
}

// The first sweep was rolled back and the second one cannot begin: every row is still there.
TYPED_TEST(SweepTest, FailsWhenTheRowsCannotBeReadAgain) {
  const FaultyDisk disk;
  const std::string unread = "3 oauth_db_basic.cpp Get failed[" + this->table_ + "]";
  int secondReads = 0;
  for (int nth = 1; nth < 20; ++nth) {
    SCOPED_TRACE(nth);
    this->execute("DROP TRIGGER IF EXISTS t; DELETE FROM " + this->table_);
    this->insertExpired(3);
    this->onDeleteOf(2, "ROLLBACK, 'all back'");
    TypeParam store(this->table_);
    this->log_.clear();
    FaultyDisk::fail(FaultyDisk::Call::kLock, nth, SQLITE_IOERR_LOCK);
    const int result = store.Purge();
    FaultyDisk::mend();
    const Lines lines = this->log_.lines();
    if (lines.size() < 3 || lines.back() != unread) continue;
    ++secondReads;
    EXPECT_EQ(0, result);
    EXPECT_THAT(this->ids(), ElementsAre("1", "2", "3"));
  }
  EXPECT_GT(secondReads, 0);
}

// One write finds the disk full: each in turn, in a delete or in the commit.
TYPED_TEST(SweepTest, SurvivesAMomentWithoutRoom) {
  const FaultyDisk disk;
  int faults = 0;
  for (;; ++faults) {
    SCOPED_TRACE(faults);
    this->insertExpired(5);
    TypeParam store(this->table_);
    FaultyDisk::fail(FaultyDisk::Call::kWrite, faults + 1, SQLITE_FULL);
    EXPECT_EQ(1, store.Purge());
    EXPECT_THAT(this->ids(), IsEmpty());
    if (!FaultyDisk::mend()) break;
    this->expectError(store, 13, "database or disk is full");
  }
  EXPECT_GT(faults, 3);
}

TYPED_TEST(SweepTest, ReportsADiskThatStaysFull) {
  const FaultyDisk disk;
  this->insertExpired(2);
  TypeParam store(this->table_);
  FaultyDisk::fillAfter(0);
  EXPECT_EQ(0, store.Purge());
  EXPECT_TRUE(FaultyDisk::mend());
  EXPECT_THAT(this->ids(), ElementsAre("1", "2"));
  this->expectError(store, 13, "database or disk is full");
}

TYPED_TEST(SweepTest, TriesRowByRowWhereNoTransactionCanBegin) {
  this->insertExpired(2);
  TypeParam store(this->table_);
  const OtherConnection other(this->files_.database(), "BEGIN IMMEDIATE");
  EXPECT_EQ(0, store.Purge());
  const std::string busy = "3 oauth_db_basic.cpp Run Command failed!![database is locked][5]";
  const std::string failed = "3 oauth_db_basic.cpp Delete failed[" + this->table_ + "]";
  EXPECT_THAT(this->log_.lines(), ElementsAre(busy, busy, failed, busy, failed));
  this->expectError(store, 5, "database is locked");
}

TYPED_TEST(SweepTest, DeletesNothingWhenItCannotCommit) {
  this->insertExpired(2);
  TypeParam store(this->table_);
  // A reader blocks the commit, but not the statements before it.
  const OtherConnection other(this->files_.database(), "BEGIN; SELECT * FROM " + this->table_);
  EXPECT_EQ(0, store.Purge());
  EXPECT_THAT(this->ids(), ElementsAre("1", "2"));
  this->expectError(store, 5, "database is locked");
  EXPECT_THAT(this->log_.lines(),
              ElementsAre("3 oauth_db_basic.cpp Run Command failed!![database is locked][5]"));
}

TYPED_TEST(SweepTest, IsAPartOfTheCallersTransaction) {
  for (const std::string begin : {"BEGIN;", "BEGIN IMMEDIATE;", "SAVEPOINT mine;"}) {
    SCOPED_TRACE(begin);
    this->insertExpired(2);
    TypeParam store(this->table_);
    EXPECT_TRUE(store.DBCmd(begin, nullptr, nullptr));
    EXPECT_EQ(1, store.Purge());
    EXPECT_THAT(this->ids(), ElementsAre("1", "2"));  // for others, until the caller commits
    EXPECT_TRUE(store.DBCmd("COMMIT;", nullptr, nullptr));
    EXPECT_THAT(this->ids(), IsEmpty());
    this->expectError(store, 255, "");
  }
  EXPECT_THAT(this->log_.lines(), IsEmpty());
}

TYPED_TEST(SweepTest, IsRolledBackWithTheCallersTransaction) {
  this->insertExpired(2);
  TypeParam store(this->table_);
  EXPECT_TRUE(store.DBCmd("BEGIN;", nullptr, nullptr));
  EXPECT_EQ(1, store.Purge());
  EXPECT_TRUE(store.DBCmd("ROLLBACK;", nullptr, nullptr));
  EXPECT_THAT(this->ids(), ElementsAre("1", "2"));
  this->expectError(store, 255, "");
}

// The library does not commit a part of the caller's transaction.
TYPED_TEST(SweepTest, FailsWhereSqliteEndsTheCallersTransaction) {
  const FaultyDisk disk;
  this->insertMoreThanTheJournalHolds();
  TypeParam store(this->table_);
  EXPECT_TRUE(store.DBCmd("BEGIN; INSERT INTO oauth_log VALUES(1, 'lost', 1);", nullptr, nullptr));
  FaultyDisk::limitJournal(this->kJournalRoom);
  EXPECT_EQ(0, store.Purge());
  EXPECT_TRUE(FaultyDisk::mend());
  EXPECT_EQ(200, this->rowCount(this->table_));
  EXPECT_FALSE(store.DBCmd("COMMIT;", nullptr, nullptr));
  this->expectError(store, 1, "cannot commit - no transaction is active");
  EXPECT_EQ(0, this->rowCount("oauth_log"));
}

TYPED_TEST(SweepTest, KeepsTheCallersTransactionOpenAfterAFailedDelete) {
  this->insertExpired(3);
  this->onDeleteOf(2, "ABORT, 'kept'");
  TypeParam store(this->table_);
  EXPECT_TRUE(store.DBCmd("BEGIN;", nullptr, nullptr));
  EXPECT_EQ(0, store.Purge());
  EXPECT_TRUE(store.DBCmd("COMMIT;", nullptr, nullptr));
  EXPECT_THAT(this->ids(), ElementsAre("2"));
  this->expectError(store, 19, "kept");
}

// SQLite then undoes the last statement alone, and what the caller did before stays.
TYPED_TEST(SweepTest, KeepsTheCallersTransactionOpenOnAFullDisk) {
  const FaultyDisk disk;
  this->insertMoreThanTheJournalHolds();
  this->onDeleteOf(0, "ABORT, 'never'");
  TypeParam store(this->table_);
  EXPECT_TRUE(store.DBCmd("BEGIN; INSERT INTO oauth_log VALUES(1, 'kept', 1);", nullptr, nullptr));
  FaultyDisk::limitJournal(this->kJournalRoom);
  EXPECT_EQ(0, store.Purge());
  EXPECT_TRUE(FaultyDisk::mend());
  EXPECT_TRUE(store.DBCmd("COMMIT;", nullptr, nullptr));
  EXPECT_EQ(1, this->rowCount("oauth_log"));
  EXPECT_GT(this->rowCount(this->table_), 0);
  EXPECT_LT(this->rowCount(this->table_), 200);
  this->expectError(store, 13, "database or disk is full");
}

TYPED_TEST(SweepTest, LeavesTheStoreUsableAfterAFailedCommit) {
  this->insertExpired(2);
  TypeParam store(this->table_);
  {
    const OtherConnection other(this->files_.database(), "BEGIN; SELECT * FROM " + this->table_);
    EXPECT_EQ(0, store.Purge());
  }
  EXPECT_EQ(1, store.Purge());
  EXPECT_THAT(this->ids(), IsEmpty());
}

}  // namespace
