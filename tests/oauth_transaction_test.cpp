// What is done in one transaction: the first creation of the database, and the sweep of expired
// rows by either store.

#include "oauth_transaction.h"

#include <memory>

#include "oauth_grantCode.h"
#include "oauth_token.h"
#include "store_test.h"

using testing::ElementsAre;
using testing::IsEmpty;
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

TYPED_TEST(SweepTest, WritesNothingWithNothingExpired) {
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

// What was deleted before the error comes back with it; the rest goes row by row.
TYPED_TEST(SweepTest, GoesOnRowByRowWhenSqliteEndsTheTransaction) {
  this->insertExpired(4);
  this->onDeleteOf(2, "ROLLBACK, 'all back'");
  TypeParam store(this->table_);
  const unsigned before = this->commits();
  EXPECT_EQ(0, store.Purge());
  EXPECT_THAT(this->ids(), ElementsAre("1", "2"));
  EXPECT_EQ(before + 2, this->commits());
  this->expectError(store, 19, "all back");
  EXPECT_THAT(this->log_.lines(),
              ElementsAre("3 oauth_db_basic.cpp Run Command failed!![all back][19]",
                          "3 oauth_db_basic.cpp Delete failed[" + this->table_ + "]"));
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
  // A reader keeps the file from being written, not from being prepared for it.
  const OtherConnection other(this->files_.database(), "BEGIN; SELECT * FROM " + this->table_);
  EXPECT_EQ(0, store.Purge());
  EXPECT_THAT(this->ids(), ElementsAre("1", "2"));
  this->expectError(store, 5, "database is locked");
  EXPECT_THAT(this->log_.lines(),
              ElementsAre("3 oauth_db_basic.cpp Run Command failed!![database is locked][5]"));
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
