#include "oauth_db_basic.h"

#include <dlfcn.h>
#include <sqlite3.h>
#include <sys/stat.h>
#include <unistd.h>

#include <cerrno>
#include <climits>
#include <filesystem>
#include <fstream>
#include <functional>
#include <optional>
#include <stdexcept>
#include <type_traits>

#include "oauth_clientInfo.h"
#include "oauth_grantCode.h"
#include "oauth_log.h"
#include "oauth_token.h"
#include "store_test.h"

using testing::ElementsAre;
using testing::ElementsAreArray;
using testing::IsEmpty;
using ZEVOOAUTHSERVER::kErrBadParameters;
using ZEVOOAUTHSERVER::kErrCreateTable;
using ZEVOOAUTHSERVER::kErrNone;
using ZEVOOAUTHSERVER::OAUTHDBBasic;
using ZEVOOAUTHSERVER::OAUTHDBClientInfo;
using ZEVOOAUTHSERVER::OAUTHDBGrantCode;
using ZEVOOAUTHSERVER::OAUTHDBLog;
using ZEVOOAUTHSERVER::OAUTHDBToken;

namespace {

// Records the ids and errno whenever a connection is opened or closed. duringOpen and duringClose
// run at that moment, after the ids were raised and before they are restored.
class ConnectionWatch {
 public:
  ConnectionWatch() { current = this; }
  ~ConnectionWatch() { current = nullptr; }
  ConnectionWatch(const ConnectionWatch&) = delete;
  ConnectionWatch& operator=(const ConnectionWatch&) = delete;

  static void opening(int error);
  static void watchClosing(sqlite3* db);

  std::vector<std::string> seen;  // "open as 0:0, errno 0", "close as 0:0"
  std::function<void()> duringOpen = [] {}, duringClose = [] {};

 private:
  static std::string ids() { return std::to_string(geteuid()) + ":" + std::to_string(getegid()); }
  static void unused(sqlite3_context*, int, sqlite3_value**) {}
  static void closing(void*);
  static void rollingBack(void*);

  static ConnectionWatch* current;
};

ConnectionWatch* ConnectionWatch::current = nullptr;

void ConnectionWatch::opening(int error) {
  if (current == nullptr) return;
  current->seen.push_back("open as " + ids() + ", errno " + std::to_string(error));
  current->duringOpen();
}

// SQLite calls the destructors of a connection's functions while it closes the connection.
void ConnectionWatch::watchClosing(sqlite3* db) {
  if (current == nullptr) return;
  sqlite3_create_function_v2(db, "watch", 0, SQLITE_UTF8, nullptr, unused, nullptr, nullptr,
                             closing);
  sqlite3_rollback_hook(db, rollingBack, nullptr);
}

void ConnectionWatch::rollingBack(void*) {
  if (current != nullptr) current->seen.push_back("roll back as " + ids());
}

void ConnectionWatch::closing(void*) {
  if (current == nullptr) return;
  current->seen.push_back("close as " + ids());
  current->duringClose();
}

}  // namespace

extern "C" int sqlite3_open_v2(const char* path, sqlite3** db, int flags, const char* vfs) {
  ConnectionWatch::opening(errno);
  const auto next =
      reinterpret_cast<decltype(&sqlite3_open_v2)>(dlsym(RTLD_NEXT, "sqlite3_open_v2"));
  const int result = next(path, db, flags, vfs);
  if (result == SQLITE_OK) ConnectionWatch::watchClosing(*db);
  return result;
}

namespace {

constexpr char kTables[] = "SELECT name FROM sqlite_master WHERE type='table' ORDER BY rowid";
constexpr char kMetaRows[] = "SELECT tab_name, version, typeof(version) FROM oauth_meta";

// Locks the file: no other connection can read or write.
class ExclusiveLock {
 public:
  explicit ExclusiveLock(const std::string& path) {
    if (sqlite3_open_v2(path.c_str(), &db_, SQLITE_OPEN_READWRITE | SQLITE_OPEN_CREATE, nullptr) !=
            SQLITE_OK ||
        sqlite3_exec(db_, "BEGIN EXCLUSIVE", nullptr, nullptr, nullptr) != SQLITE_OK)
      throw std::runtime_error("cannot lock " + path);
  }
  ~ExclusiveLock() { sqlite3_close_v2(db_); }
  ExclusiveLock(const ExclusiveLock&) = delete;
  ExclusiveLock& operator=(const ExclusiveLock&) = delete;

 private:
  sqlite3* db_ = nullptr;
};

class LifecycleTest : public StoreTest {
 protected:
  void createDatabaseFile(const std::string& content) const {
    std::ofstream(files_.database(), std::ios::binary) << content;
  }
  // Makes CREATE TABLE fail for this name only.
  void occupyName(const std::string& name) const {
    execute("CREATE TABLE occupied(a); CREATE INDEX " + name + " ON occupied(a)");
  }

  void expectReady(OAUTHDBBasic& store) {
    log_.clear();
    EXPECT_TRUE(store.DBCmd("SELECT 1;", nullptr, nullptr));
    EXPECT_THAT(log_.lines(), IsEmpty());
  }
  // The store refuses statements and keeps the error that was the reason.
  void expectUnready(OAUTHDBBasic& store, int code, const std::string& msg) {
    log_.clear();
    EXPECT_FALSE(store.DBCmd("SELECT 1;", nullptr, nullptr));
    EXPECT_THAT(log_.lines(), ElementsAre("3 oauth_db_basic.cpp DB is not ready!!"));
    expectError(store, code, msg);
  }
};

// --- A fresh file ---

class SchemaTest : public LifecycleTest {};

TEST_F(SchemaTest, GivesAFreshFileExactlyFiveTables) {
  const OAUTHDBBasic store;
  EXPECT_THAT(query(kTables), ElementsAre("oauth_meta", "oauth_clientInfo", "oauth_token",
                                          "oauth_grantCode", "oauth_log"));
}

TEST_F(SchemaTest, KeepsTheTextsOfExistingInstallations) {
  const OAUTHDBBasic store;
  EXPECT_THAT(
      query("SELECT sql FROM sqlite_master WHERE sql IS NOT NULL ORDER BY rowid"),
      ElementsAre("CREATE TABLE oauth_meta(tab_name text NOT NULL, version integer NOT NULL)",
                  "CREATE TABLE oauth_clientInfo(enable text NOT NULL, "
                  "client_id text NOT NULL UNIQUE, client_secret text NOT NULL, "
                  "redirect_uri text NOT NULL, scope text NOT NULL, display_name text NOT NULL, "
                  "id integer PRIMARY KEY)",
                  "CREATE TABLE oauth_token(username text NOT NULL,  client_id text NOT NULL,  "
                  "scope text NOT NULL,  refresh_token text NOT NULL, "
                  "access_token text NOT NULL UNIQUE, expired_time text NOT NULL, "
                  "flow_type text NOT NULL, state text NOT NULL, "
                  "ip text NOT NULL DEFAULT 'None', id integer PRIMARY KEY)",
                  "CREATE TABLE oauth_grantCode(username text NOT NULL, client_id text NOT NULL, "
                  "scope text NOT NULL, code text NOT NULL UNIQUE, expired_time text NOT NULL, "
                  "state text NOT NULL, ip text NOT NULL DEFAULT 'None', id integer PRIMARY KEY)",
                  "CREATE TABLE oauth_log(timestamp integer NOT NULL, msg text NOT NULL, "
                  "id integer PRIMARY KEY)"));
}

TEST_F(SchemaTest, RecordsTheVersionsOfThreeTablesAsIntegers) {
  const OAUTHDBBasic store;
  EXPECT_THAT(query(kMetaRows), ElementsAre("oauth_clientInfo|2|integer",
                                            "oauth_grantCode|2|integer", "oauth_token|2|integer"));
}

TEST_F(SchemaTest, TreatsAnEmptyFileAsAFreshOne) {
  createDatabaseFile("");
  OAUTHDBBasic store;
  EXPECT_THAT(query(kTables), ElementsAre("oauth_meta", "oauth_clientInfo", "oauth_token",
                                          "oauth_grantCode", "oauth_log"));
  EXPECT_EQ(3, rowCount("oauth_meta"));
  expectReady(store);
}

struct UniqueColumn {
  const char* insert;
  const char* error;
};

class UniqueColumnTest : public SchemaTest, public testing::WithParamInterface<UniqueColumn> {};

TEST_P(UniqueColumnTest, RefusesAValueTwice) {
  OAUTHDBBasic store;
  EXPECT_TRUE(store.DBCmd(GetParam().insert, nullptr, nullptr));
  EXPECT_FALSE(store.DBCmd(GetParam().insert, nullptr, nullptr));
  expectError(store, 19, GetParam().error);
  EXPECT_THAT(log_.lines(), ElementsAre(std::string("3 oauth_db_basic.cpp Run Command failed!![") +
                                        GetParam().error + "][19]"));
}

INSTANTIATE_TEST_SUITE_P(
    Tables, UniqueColumnTest,
    testing::Values(
        UniqueColumn{"INSERT INTO oauth_clientInfo VALUES('1','c','s','u','s','d',NULL)",
                     "UNIQUE constraint failed: oauth_clientInfo.client_id"},
        UniqueColumn{
            "INSERT INTO oauth_token VALUES('u','c','s','r','a','9','f','s','192.0.2.7',NULL)",
            "UNIQUE constraint failed: oauth_token.access_token"},
        UniqueColumn{"INSERT INTO oauth_grantCode VALUES('u','c','s','k','9','s','192.0.2.7',NULL)",
                     "UNIQUE constraint failed: oauth_grantCode.code"}));

TEST_F(SchemaTest, RefusesASecondClientOfTheSamePlainIdentifier) {
  OAUTHDBClientInfo clients("oauth_clientInfo");
  Json::Value result;
  EXPECT_EQ(1, clients.Add(times(64, 'c'), times(64, 's'), "one", "read", "One", "1", result));
  EXPECT_EQ(0, clients.Add(times(64, 'c'), times(64, 't'), "two", "read", "Two", "1", result));
  expectError(clients, 19, "UNIQUE constraint failed: oauth_clientInfo.client_id");
  EXPECT_THAT(log_.lines(),
              ElementsAre("3 oauth_db_basic.cpp Run Command failed!!"
                          "[UNIQUE constraint failed: oauth_clientInfo.client_id][19]",
                          "3 oauth_db_basic.cpp Add failed[oauth_clientInfo]"));
  EXPECT_THAT(query("SELECT display_name FROM oauth_clientInfo"), ElementsAre("One"));
}

TEST_F(SchemaTest, StoresNoneForATokenWithoutAnAddress) {
  const OAUTHDBBasic store;
  execute(
      "INSERT INTO oauth_token(username, client_id, scope, refresh_token, access_token, "
      "expired_time, flow_type, state) VALUES('u','c','s','r','a','9','f','s')");
  EXPECT_THAT(query("SELECT ip FROM oauth_token"), ElementsAre("None"));
}

TEST_F(SchemaTest, StoresNoneForACodeWithoutAnAddress) {
  const OAUTHDBBasic store;
  execute(
      "INSERT INTO oauth_grantCode(username, client_id, scope, code, expired_time, state) "
      "VALUES('u','c','s','k','9','s')");
  EXPECT_THAT(query("SELECT ip FROM oauth_grantCode"), ElementsAre("None"));
}

TEST_F(SchemaTest, KeepsAnExpiryAsText) {
  const OAUTHDBBasic store;
  execute("INSERT INTO oauth_grantCode VALUES('u','c','s','k',1700000000,'s','',NULL)");
  EXPECT_THAT(query("SELECT expired_time, typeof(expired_time) FROM oauth_grantCode"),
              ElementsAre("1700000000|text"));
}

TEST_F(SchemaTest, KeepsALogTimeAsAnInteger) {
  const OAUTHDBBasic store;
  execute("INSERT INTO oauth_log VALUES('1700000000','m',NULL)");
  EXPECT_THAT(query("SELECT timestamp, typeof(timestamp) FROM oauth_log"),
              ElementsAre("1700000000|integer"));
}

// --- Every class of store ---

template <class Store>
class EveryStoreTest : public StoreTest {};

using Stores = testing::Types<OAUTHDBClientInfo, OAUTHDBGrantCode, OAUTHDBToken, OAUTHDBLog>;
TYPED_TEST_SUITE(EveryStoreTest, Stores);

TYPED_TEST(EveryStoreTest, CreatesAllFiveTables) {
  const TypeParam store("oauth_token");
  EXPECT_THAT(this->query(kTables), ElementsAre("oauth_meta", "oauth_clientInfo", "oauth_token",
                                                "oauth_grantCode", "oauth_log"));
  EXPECT_EQ(3, this->rowCount("oauth_meta"));
  EXPECT_THAT(this->log_.lines(), IsEmpty());
}

TYPED_TEST(EveryStoreTest, ServesTheTableItIsGiven) {
  const TypeParam store("some_table");
  EXPECT_EQ("some_table", store.GetTabName());
  EXPECT_EQ(-1, this->rowCount("some_table"));
}

TYPED_TEST(EveryStoreTest, StartsWithoutAnError) {
  const TypeParam store("oauth_token");
  EXPECT_EQ(255, store.GetErrCode());
  EXPECT_EQ("", store.GetErrMsg());
}

TYPED_TEST(EveryStoreTest, ClosesWhatItOpened) {
  { const TypeParam store("oauth_token"); }
  EXPECT_THAT(this->files_.calls(), ElementsAre("open /var/packages/Keyloft/target/etc/oauth.db",
                                                "busy_timeout 5000", "close"));
}

TYPED_TEST(EveryStoreTest, CannotBeCopied) {
  EXPECT_FALSE(std::is_copy_constructible_v<TypeParam>);
  EXPECT_FALSE(std::is_copy_assignable_v<TypeParam>);
  EXPECT_FALSE(std::is_move_constructible_v<TypeParam>);
  EXPECT_FALSE(std::is_move_assignable_v<TypeParam>);
}

TYPED_TEST(EveryStoreTest, HasNoVirtualOperation) {
  EXPECT_FALSE(std::is_polymorphic_v<TypeParam>);
}

// --- The object ---

class AccessorTest : public LifecycleTest {};

TEST_F(AccessorTest, CannotCopyTheBase) {
  EXPECT_FALSE(std::is_copy_constructible_v<OAUTHDBBasic>);
  EXPECT_FALSE(std::is_copy_assignable_v<OAUTHDBBasic>);
  EXPECT_FALSE(std::is_move_constructible_v<OAUTHDBBasic>);
  EXPECT_FALSE(std::is_move_assignable_v<OAUTHDBBasic>);
}

TEST_F(AccessorTest, StartsWithoutAnErrorAfterAGoodOpen) {
  const OAUTHDBBasic store;
  expectError(store, 255, "");
  EXPECT_EQ(255, kErrNone);
  EXPECT_THAT(log_.lines(), IsEmpty());
}

TEST_F(AccessorTest, KnowsNoTableBeforeItIsTold) {
  const OAUTHDBBasic store;
  EXPECT_EQ("", store.GetTabName());
}

TEST_F(AccessorTest, GivesBackTheErrorCode) {
  OAUTHDBBasic store;
  for (const int code : {0, -1, 21, INT_MIN, INT_MAX}) {
    store.SetErrCode(code);
    EXPECT_EQ(code, store.GetErrCode());
  }
  EXPECT_EQ("", store.GetErrMsg());
}

TEST_F(AccessorTest, GivesBackTheErrorMessage) {
  OAUTHDBBasic store;
  for (const std::string& msg :
       {std::string("Bad parameters"), std::string(), std::string("a\0b", 3), times(100000)}) {
    store.SetErrMsg(msg);
    EXPECT_EQ(msg, store.GetErrMsg());
  }
  EXPECT_EQ(255, store.GetErrCode());
}

TEST_F(AccessorTest, GivesBackTheTableName) {
  OAUTHDBBasic store;
  for (const std::string& name : {std::string("oauth_log"), std::string(), times(100000)}) {
    store.SetTabName(name);
    EXPECT_EQ(name, store.GetTabName());
  }
}

TEST_F(AccessorTest, HandsOutTheMessageAsACopy) {
  OAUTHDBBasic store;
  store.SetErrMsg("first");
  const std::string msg = store.GetErrMsg();
  store.SetErrMsg("second");
  EXPECT_EQ("first", msg);
}

// --- An existing file ---

class ExistingFileTest : public LifecycleTest {
 protected:
  void SetUp() override { const OAUTHDBBasic first; }
};

TEST_F(ExistingFileTest, GetsNoFurtherVersionRows) {
  OAUTHDBBasic second;
  EXPECT_THAT(query(kMetaRows), ElementsAre("oauth_clientInfo|2|integer",
                                            "oauth_grantCode|2|integer", "oauth_token|2|integer"));
  expectReady(second);
}

TEST_F(ExistingFileTest, IsNotWrittenTo) {
  const std::string before = databaseBytes();
  { const OAUTHDBBasic second; }
  EXPECT_FALSE(before.empty());
  EXPECT_EQ(before, databaseBytes());
}

TEST_F(ExistingFileTest, KeepsTheVersionsItHas) {
  execute("UPDATE oauth_meta SET version = 1");
  const OAUTHDBBasic second;
  EXPECT_THAT(query("SELECT tab_name, version FROM oauth_meta"),
              ElementsAre("oauth_clientInfo|1", "oauth_grantCode|1", "oauth_token|1"));
}

TEST_F(ExistingFileTest, KeepsAnEmptyMetaTableEmpty) {
  execute("DELETE FROM oauth_meta");
  const OAUTHDBBasic second;
  EXPECT_EQ(0, rowCount("oauth_meta"));
}

TEST_F(ExistingFileTest, GetsBackAMissingTable) {
  execute("DROP TABLE oauth_token; DELETE FROM oauth_meta");
  OAUTHDBBasic second;
  EXPECT_EQ(0, rowCount("oauth_token"));
  EXPECT_EQ(0, rowCount("oauth_meta"));
  expectReady(second);
}

TEST_F(ExistingFileTest, GetsTheVersionRowsWithANewMetaTable) {
  execute("DROP TABLE oauth_meta");
  const OAUTHDBBasic second;
  EXPECT_EQ(3, rowCount("oauth_meta"));
}

TEST_F(ExistingFileTest, KeepsItsRows) {
  execute("INSERT INTO oauth_log VALUES(1700000000, 'kept', 7)");
  { const OAUTHDBBasic second; }
  EXPECT_THAT(query("SELECT * FROM oauth_log"), ElementsAre("1700000000|kept|7"));
}

TEST_F(ExistingFileTest, ServesSeveralStoresAtATime) {
  OAUTHDBBasic second, third;
  expectReady(second);
  expectReady(third);
}

TEST_F(ExistingFileTest, MakesAReadyStoreWithoutTheRightToWrite) {
  files_.openReadOnly();
  OAUTHDBBasic store;
  expectError(store, 255, "");
  EXPECT_THAT(log_.lines(), IsEmpty());
  expectReady(store);
}

// --- Open failures ---

class OpenFailureTest : public LifecycleTest {};

TEST_F(OpenFailureTest, ReportsAMissingDirectory) {
  files_.removeDirectory();
  OAUTHDBBasic store;
  EXPECT_THAT(log_.lines(), ElementsAre("3 oauth_db_basic.cpp Open DB failed!![14]",
                                        "3 oauth_db_basic.cpp Run Command failed!![][21]",
                                        "3 oauth_db_basic.cpp Run Command failed!![][21]",
                                        "3 oauth_db_basic.cpp Create Table failed!![meta]"));
  EXPECT_THAT(
      log_.formats(),
      ElementsAre("%s:%d Open DB failed!![%d]", "%s:%d Run Command failed!![%s][%d]",
                  "%s:%d Run Command failed!![%s][%d]", "%s:%d Create Table failed!![meta]"));
  expectError(store, kErrCreateTable, "Create table failed");
  expectUnready(store, -1, "Create table failed");
  EXPECT_FALSE(std::filesystem::exists(files_.directory()));
}

TEST_F(OpenFailureTest, ClosesTheHandleOfAFailedOpen) {
  files_.removeDirectory();
  { const OAUTHDBBasic store; }
  EXPECT_THAT(files_.calls(),
              ElementsAre("open /var/packages/Keyloft/target/etc/oauth.db", "close"));
}

TEST_F(OpenFailureTest, ReportsADirectoryInPlaceOfTheFile) {
  std::filesystem::create_directory(files_.database());
  OAUTHDBBasic store;
  EXPECT_THAT(log_.lines(), ElementsAre("3 oauth_db_basic.cpp Open DB failed!![14]",
                                        "3 oauth_db_basic.cpp Run Command failed!![][21]",
                                        "3 oauth_db_basic.cpp Run Command failed!![][21]",
                                        "3 oauth_db_basic.cpp Create Table failed!![meta]"));
  expectError(store, -1, "Create table failed");
  expectUnready(store, -1, "Create table failed");
  EXPECT_TRUE(std::filesystem::is_empty(files_.database()));
}

TEST_F(OpenFailureTest, ReportsAFileThatIsNoDatabase) {
  for (const std::string& content : {std::string("{}"), times(5000, 'x')}) {
    SCOPED_TRACE(content.size());
    createDatabaseFile(content);
    log_.clear();
    {
      OAUTHDBBasic store;
      EXPECT_THAT(
          log_.lines(),
          ElementsAre("3 oauth_db_basic.cpp Run Command failed!![file is not a database][26]",
                      "3 oauth_db_basic.cpp Run Command failed!![file is not a database][26]",
                      "3 oauth_db_basic.cpp Create Table failed!![meta]"));
      expectError(store, -1, "Create table failed");
      expectUnready(store, -1, "Create table failed");
    }
    EXPECT_EQ(content, databaseBytes());
  }
}

TEST_F(OpenFailureTest, ReportsAMissingFileThatItMayNotCreate) {
  files_.openReadOnly();
  OAUTHDBBasic store;
  EXPECT_THAT(log_.lines(), ElementsAre("3 oauth_db_basic.cpp Open DB failed!![14]",
                                        "3 oauth_db_basic.cpp Run Command failed!![][21]",
                                        "3 oauth_db_basic.cpp Run Command failed!![][21]",
                                        "3 oauth_db_basic.cpp Create Table failed!![meta]"));
  expectUnready(store, -1, "Create table failed");
  EXPECT_FALSE(std::filesystem::exists(files_.database()));
}

TEST_F(OpenFailureTest, ReportsAnEmptyFileThatItMayNotWrite) {
  createDatabaseFile("");
  files_.openReadOnly();
  OAUTHDBBasic store;
  EXPECT_THAT(log_.lines(), ElementsAre("3 oauth_db_basic.cpp Run Command failed!!"
                                        "[attempt to write a readonly database][8]",
                                        "3 oauth_db_basic.cpp Create Table failed!![meta]"));
  expectError(store, -1, "Create table failed");
  expectUnready(store, -1, "Create table failed");
  EXPECT_EQ("", databaseBytes());
}

TEST_F(OpenFailureTest, ReportsALockedFile) {
  { const OAUTHDBBasic first; }
  const std::string before = databaseBytes();
  {
    const ExclusiveLock lock(files_.database());
    OAUTHDBBasic store;
    EXPECT_THAT(log_.lines(),
                ElementsAre("3 oauth_db_basic.cpp Run Command failed!![database is locked][5]",
                            "3 oauth_db_basic.cpp Run Command failed!![database is locked][5]",
                            "3 oauth_db_basic.cpp Create Table failed!![meta]"));
    expectError(store, -1, "Create table failed");
    expectUnready(store, -1, "Create table failed");
  }
  EXPECT_EQ(before, databaseBytes());
}

TEST_F(OpenFailureTest, RecordsTheOpenResultWithoutAHandle) {
  files_.openWithoutHandle(7);
  OAUTHDBBasic store;
  expectError(store, 7, "Open DB failed!!");
  EXPECT_THAT(log_.lines(), ElementsAre("3 oauth_db_basic.cpp Open DB failed!![7]"));
  expectUnready(store, 7, "Open DB failed!!");
}

TEST_F(OpenFailureTest, HasNothingToCloseWithoutAHandle) {
  files_.openWithoutHandle(7);
  ids_.become(1000, 500);
  std::optional<OAUTHDBBasic> store;
  store.emplace();
  const std::size_t calls = ids_.calls().size();
  log_.clear();
  store.reset();
  EXPECT_THAT(files_.calls(), ElementsAre("open /var/packages/Keyloft/target/etc/oauth.db"));
  EXPECT_EQ(calls, ids_.calls().size());
  EXPECT_THAT(log_.lines(), IsEmpty());
}

TEST_F(OpenFailureTest, LeavesTheAccessorsUsable) {
  files_.openWithoutHandle(7);
  OAUTHDBLog store("oauth_log");
  EXPECT_EQ("oauth_log", store.GetTabName());
  store.SetErrCode(kErrBadParameters);
  store.SetErrMsg("Bad parameters");
  expectError(store, -2, "Bad parameters");
}

TEST_F(OpenFailureTest, RecordsAnEmptyMessageWithoutAHandle) {
  files_.openWithoutHandle(7);
  OAUTHDBBasic store;
  log_.clear();
  EXPECT_FALSE(store.DBDrop());
  expectError(store, 21, "");
  EXPECT_THAT(log_.lines(), ElementsAre("3 oauth_db_basic.cpp Run Command failed!![][21]"));
}

// --- Initialisation ---

class InitTest : public LifecycleTest {};

TEST_F(InitTest, SucceedsAgainOnAReadyStore) {
  OAUTHDBBasic store;
  EXPECT_TRUE(store.DBInit());
  EXPECT_EQ(3, rowCount("oauth_meta"));
  expectError(store, 255, "");
}

TEST_F(InitTest, DoesNothingWithoutAHandle) {
  withDiagnostics(15, [this] {
    files_.openWithoutHandle(7);
    OAUTHDBBasic store;
    log_.clear();
    EXPECT_FALSE(store.DBInit());
    expectError(store, 7, "Open DB failed!!");
  });
  EXPECT_THAT(log_.lines(), IsEmpty());
}

TEST_F(InitTest, MakesTheStoreReadyOnceTheCauseIsGone) {
  std::optional<ExclusiveLock> lock(files_.database());
  OAUTHDBBasic store;
  expectUnready(store, -1, "Create table failed");
  lock.reset();
  log_.clear();
  EXPECT_TRUE(store.DBInit());
  EXPECT_THAT(log_.lines(), IsEmpty());
  expectReady(store);
  EXPECT_EQ(3, rowCount("oauth_meta"));
}

TEST_F(InitTest, KeepsTheEarlierErrorWhenItSucceedsLater) {
  std::optional<ExclusiveLock> lock(files_.database());
  OAUTHDBBasic store;
  lock.reset();
  EXPECT_TRUE(store.DBInit());
  expectError(store, -1, "Create table failed");
}

TEST_F(InitTest, KeepsAReadyStoreReadyWhenItFailsLater) {
  OAUTHDBBasic store;
  {
    const ExclusiveLock lock(files_.database());
    EXPECT_TRUE(store.DBInit());  // tells whether the store is ready, and it was already
  }
  expectError(store, -1, "Create table failed");
  EXPECT_THAT(log_.lines(),
              ElementsAre("3 oauth_db_basic.cpp Run Command failed!![database is locked][5]",
                          "3 oauth_db_basic.cpp Run Command failed!![database is locked][5]",
                          "3 oauth_db_basic.cpp Create Table failed!![meta]"));
  expectReady(store);
}

TEST_F(InitTest, WritesNoVersionsWithoutAMetaTable) {
  occupyName("oauth_meta");
  OAUTHDBBasic store;
  EXPECT_THAT(log_.lines(), ElementsAre("3 oauth_db_basic.cpp Run Command failed!!"
                                        "[there is already an index named oauth_meta][1]",
                                        "3 oauth_db_basic.cpp Create Table failed!![meta]"));
  expectError(store, -1, "Create table failed");
  expectUnready(store, -1, "Create table failed");
  EXPECT_THAT(query(kTables), ElementsAre("occupied"));
}

TEST_F(InitTest, CreatesNothingWithoutVersionRows) {
  execute("CREATE VIEW oauth_meta AS SELECT 1 AS tab_name, 2 AS version");
  const std::string before = databaseBytes();
  OAUTHDBBasic store;
  const std::string failed =
      "3 oauth_db_basic.cpp Run Command failed!![cannot modify oauth_meta because it is a view][1]";
  EXPECT_THAT(log_.lines(), ElementsAre(failed, "3 oauth_db_basic.cpp Add Meta failed", failed,
                                        "3 oauth_db_basic.cpp Add Meta failed", failed,
                                        "3 oauth_db_basic.cpp Add Meta failed",
                                        "3 oauth_db_basic.cpp Create Table failed!![meta]"));
  expectUnready(store, -1, "Create table failed");
  EXPECT_EQ(before, databaseBytes());
}

// A table that cannot be created, and the tables that exist after the attempt.
struct Obstacle {
  std::string table;
  std::vector<std::string> created;
};

void PrintTo(const Obstacle& obstacle, std::ostream* out) { *out << obstacle.table; }

class ObstacleTest : public InitTest, public testing::WithParamInterface<Obstacle> {};

TEST_P(ObstacleTest, StopsAtTheTableThatCannotBeCreated) {
  occupyName(GetParam().table);
  OAUTHDBBasic store;
  EXPECT_THAT(log_.lines(),
              ElementsAre("3 oauth_db_basic.cpp Run Command failed!![there is already an index "
                          "named " +
                              GetParam().table + "][1]",
                          "3 oauth_db_basic.cpp Create Table failed!![" + GetParam().table + "]"));
  EXPECT_THAT(log_.formats(),
              ElementsAre("%s:%d Run Command failed!![%s][%d]", "%s:%d Create Table failed!![%s]"));
  expectError(store, -1, "Create table failed");
  expectUnready(store, -1, "Create table failed");
  EXPECT_THAT(query(kTables), ElementsAreArray(GetParam().created));
  EXPECT_EQ(3, rowCount("oauth_meta"));
}

INSTANTIATE_TEST_SUITE_P(
    Tables, ObstacleTest,
    testing::Values(Obstacle{"oauth_clientInfo", {"occupied", "oauth_meta"}},
                    Obstacle{"oauth_token", {"occupied", "oauth_meta", "oauth_clientInfo"}},
                    Obstacle{"oauth_grantCode",
                             {"occupied", "oauth_meta", "oauth_clientInfo", "oauth_token"}},
                    Obstacle{"oauth_log",
                             {"occupied", "oauth_meta", "oauth_clientInfo", "oauth_token",
                              "oauth_grantCode"}}));

// --- Diagnostics of the initialisation ---

constexpr char kLooksForMeta[] =
    "3 oauth_db_basic.cpp ==> DBCmdRun[SELECT * FROM sqlite_master "
    "WHERE name='oauth_meta' and type='table';]";
constexpr char kCreatesMeta[] =
    "3 oauth_db_basic.cpp ==> DBCmdRun[CREATE TABLE IF NOT EXISTS oauth_meta("
    "tab_name text NOT NULL, version integer NOT NULL);]";
constexpr char kCreatesClientInfo[] =
    "3 oauth_db_basic.cpp ==> DBCmdRun[CREATE TABLE IF NOT EXISTS oauth_clientInfo("
    "enable text NOT NULL, client_id text NOT NULL UNIQUE, client_secret text NOT NULL, "
    "redirect_uri text NOT NULL, scope text NOT NULL, display_name text NOT NULL, "
    "id integer PRIMARY KEY);]";
constexpr char kCreatesToken[] =
    "3 oauth_db_basic.cpp ==> DBCmdRun[CREATE TABLE IF NOT EXISTS oauth_token("
    "username text NOT NULL,  client_id text NOT NULL,  scope text NOT NULL,  "
    "refresh_token text NOT NULL, access_token text NOT NULL UNIQUE, "
    "expired_time text NOT NULL, flow_type text NOT NULL, state text NOT NULL, "
    "ip text NOT NULL DEFAULT 'None', id integer PRIMARY KEY);]";
constexpr char kCreatesGrantCode[] =
    "3 oauth_db_basic.cpp ==> DBCmdRun[CREATE TABLE IF NOT EXISTS oauth_grantCode("
    "username text NOT NULL, client_id text NOT NULL, scope text NOT NULL, "
    "code text NOT NULL UNIQUE, expired_time text NOT NULL, state text NOT NULL, "
    "ip text NOT NULL DEFAULT 'None', id integer PRIMARY KEY);]";
constexpr char kCreatesLog[] =
    "3 oauth_db_basic.cpp ==> DBCmdRun[CREATE TABLE IF NOT EXISTS oauth_log("
    "timestamp integer NOT NULL, msg text NOT NULL, id integer PRIMARY KEY);]";

class InitDiagnosticsTest : public InitTest {
 protected:
  void construct(int mask) const {
    withDiagnostics(mask, [] { const OAUTHDBBasic store; });
  }
};

TEST_F(InitDiagnosticsTest, ReportsThreeTablesAsResults) {
  construct(1);
  EXPECT_THAT(log_.lines(), ElementsAre("3 oauth_db_basic.cpp ==> DBInit[init token table]",
                                        "3 oauth_db_basic.cpp ==> DBInit[init grantCode table]",
                                        "3 oauth_db_basic.cpp ==> DBInit[init log table]"));
  EXPECT_THAT(log_.formats(),
              ElementsAre("%s:%d ==> %s[init token table]", "%s:%d ==> %s[init grantCode table]",
                          "%s:%d ==> %s[init log table]"));
}

TEST_F(InitDiagnosticsTest, TracesTwoTablesAsEntries) {
  construct(8);
  EXPECT_THAT(
      log_.lines(),
      ElementsAre("3 oauth_db_basic.cpp ==> DBInit[init meta table]", kLooksForMeta,
                  "3 oauth_db_basic.cpp ==> DBCmdRun[BEGIN IMMEDIATE;]", kLooksForMeta,
                  kCreatesMeta, "3 oauth_db_basic.cpp Create tab success",
                  "3 oauth_db_basic.cpp ==> AddMetaData",
                  "3 oauth_db_basic.cpp ==> DBCmdRun[INSERT INTO oauth_meta(tab_name, version) "
                  "VALUES('oauth_clientInfo', 2);]",
                  "3 oauth_db_basic.cpp ==> DBCmdRun[INSERT INTO oauth_meta(tab_name, version) "
                  "VALUES('oauth_grantCode', 2);]",
                  "3 oauth_db_basic.cpp ==> DBCmdRun[INSERT INTO oauth_meta(tab_name, version) "
                  "VALUES('oauth_token', 2);]",
                  "3 oauth_db_basic.cpp ==> DBCmdRun[COMMIT;]",
                  "3 oauth_db_basic.cpp ==> DBInit[init client table]", kCreatesClientInfo,
                  "3 oauth_db_basic.cpp Create tab success", kCreatesToken,
                  "3 oauth_db_basic.cpp Create tab success", kCreatesGrantCode,
                  "3 oauth_db_basic.cpp Create tab success", kCreatesLog,
                  "3 oauth_db_basic.cpp Create tab success"));
}

TEST_F(InitDiagnosticsTest, KeepsTheFormatsOfTheTraces) {
  construct(8);
  EXPECT_THAT(
      log_.formats(),
      ElementsAre("%s:%d ==> %s[init meta table]", "%s:%d ==> %s[%s]", "%s:%d ==> %s[%s]",
                  "%s:%d ==> %s[%s]", "%s:%d ==> %s[%s]", "%s:%d Create tab success",
                  "%s:%d ==> %s", "%s:%d ==> %s[%s]", "%s:%d ==> %s[%s]", "%s:%d ==> %s[%s]",
                  "%s:%d ==> %s[%s]", "%s:%d ==> %s[init client table]", "%s:%d ==> %s[%s]",
                  "%s:%d Create tab success", "%s:%d ==> %s[%s]", "%s:%d Create tab success",
                  "%s:%d ==> %s[%s]", "%s:%d Create tab success", "%s:%d ==> %s[%s]",
                  "%s:%d Create tab success"));
}

TEST_F(InitDiagnosticsTest, HasNoRowToDumpInAFreshFile) {
  construct(2);
  EXPECT_THAT(log_.lines(), IsEmpty());
}

TEST_F(InitDiagnosticsTest, HasNoArgumentToDump) {
  construct(4);
  EXPECT_THAT(log_.lines(), IsEmpty());
}

TEST_F(InitDiagnosticsTest, IsSilentWithoutTheMarker) {
  writeSettings(R"({"log_level": 15})");
  onFreshThread([] { const OAUTHDBBasic store; });
  EXPECT_THAT(log_.lines(), IsEmpty());
}

TEST_F(InitDiagnosticsTest, TracesAWholeConstructionOnAnExistingFile) {
  { const OAUTHDBBasic first; }
  construct(15);
  EXPECT_THAT(
      log_.lines(),
      ElementsAre("3 oauth_db_basic.cpp ==> DBInit[init meta table]", kLooksForMeta,
                  "3 oauth_db_basic.cpp ==> IsTabExistCallback",
                  "3 oauth_db_basic.cpp ##### [0][type = table]",
                  "3 oauth_db_basic.cpp ##### [1][name = oauth_meta]",
                  "3 oauth_db_basic.cpp ##### [2][tbl_name = oauth_meta]",
                  "3 oauth_db_basic.cpp ##### [3][rootpage = 2]",
                  "3 oauth_db_basic.cpp ##### [4][sql = CREATE TABLE oauth_meta(tab_name text "
                  "NOT NULL, version integer NOT NULL)]",
                  "3 oauth_db_basic.cpp Tab[oauth_meta] is exist",
                  "3 oauth_db_basic.cpp ==> DBInit[init client table]", kCreatesClientInfo,
                  "3 oauth_db_basic.cpp Create tab success",
                  "3 oauth_db_basic.cpp ==> DBInit[init token table]", kCreatesToken,
                  "3 oauth_db_basic.cpp Create tab success",
                  "3 oauth_db_basic.cpp ==> DBInit[init grantCode table]", kCreatesGrantCode,
                  "3 oauth_db_basic.cpp Create tab success",
                  "3 oauth_db_basic.cpp ==> DBInit[init log table]", kCreatesLog,
                  "3 oauth_db_basic.cpp Create tab success"));
}

// --- Steps of the initialisation, one by one ---

class CreateTableTest : public LifecycleTest {};

TEST_F(CreateTableTest, RunsTheStatement) {
  OAUTHDBBasic store;
  EXPECT_TRUE(store.CreateDBTab("CREATE TABLE extra(a)"));
  EXPECT_EQ(0, rowCount("extra"));
  expectError(store, 255, "");
}

TEST_F(CreateTableTest, ReplacesTheErrorOfTheDatabase) {
  OAUTHDBBasic store;
  EXPECT_FALSE(store.CreateDBTab("CREATE TABLE oauth_log(a)"));
  expectError(store, -1, "Create table failed");
  EXPECT_THAT(log_.lines(), ElementsAre("3 oauth_db_basic.cpp Run Command failed!!"
                                        "[table oauth_log already exists][1]"));
}

TEST_F(CreateTableTest, KeepsAnEarlierErrorOnSuccess) {
  OAUTHDBBasic store;
  EXPECT_FALSE(store.CreateDBTab("CREATE TABLE oauth_log(a)"));
  EXPECT_TRUE(store.CreateDBTab("CREATE TABLE extra(a)"));
  expectError(store, -1, "Create table failed");
}

TEST_F(CreateTableTest, ReportsNoSuccessBesidesTheTrace) {
  withDiagnostics(7, [this] {
    OAUTHDBBasic store;
    log_.clear();
    EXPECT_TRUE(store.CreateDBTab("CREATE TABLE extra(a)"));
  });
  EXPECT_THAT(log_.lines(), IsEmpty());
}

TEST_F(CreateTableTest, TracesNoSuccessOfAFailure) {
  withDiagnostics(15, [this] {
    OAUTHDBBasic store;
    log_.clear();
    EXPECT_FALSE(store.CreateDBTab("CREATE TABLE oauth_log(a)"));
  });
  EXPECT_THAT(log_.lines(),
              ElementsAre("3 oauth_db_basic.cpp ==> DBCmdRun[CREATE TABLE oauth_log(a)]",
                          "3 oauth_db_basic.cpp Run Command failed!!"
                          "[table oauth_log already exists][1]"));
}

class TableExistsTest : public LifecycleTest {};

TEST_F(TableExistsTest, KnowsEveryTableOfTheSchema) {
  OAUTHDBBasic store;
  for (const char* const name :
       {"oauth_meta", "oauth_clientInfo", "oauth_token", "oauth_grantCode", "oauth_log"})
    EXPECT_TRUE(store.IsDBTabExist(name)) << name;
}

TEST_F(TableExistsTest, ReportsAMissingTableWithoutAnError) {
  OAUTHDBBasic store;
  for (const char* const name : {"oauth_other", "", "OAUTH_LOG", "oauth_lo_", "oauth_lo%"})
    EXPECT_FALSE(store.IsDBTabExist(name)) << name;
  expectError(store, 255, "");
  EXPECT_THAT(log_.lines(), IsEmpty());
}

TEST_F(TableExistsTest, TakesNeitherViewNorIndexForATable) {
  OAUTHDBBasic store;
  execute("CREATE VIEW a_view AS SELECT 1; CREATE INDEX an_index ON oauth_log(msg)");
  EXPECT_FALSE(store.IsDBTabExist("a_view"));
  EXPECT_FALSE(store.IsDBTabExist("an_index"));
}

TEST_F(TableExistsTest, InsertsTheNameAsItIs) {
  OAUTHDBBasic store;
  EXPECT_TRUE(store.IsDBTabExist("none' or name='oauth_log"));
  EXPECT_FALSE(store.IsDBTabExist("none'oauth_log"));
  expectError(store, 1, "near \"oauth_log\": syntax error");
  EXPECT_THAT(log_.lines(), ElementsAre("3 oauth_db_basic.cpp Run Command failed!!"
                                        "[near \"oauth_log\": syntax error][1]"));
}

TEST_F(TableExistsTest, EndsTheStatementAtANulByte) {
  OAUTHDBBasic store;
  EXPECT_FALSE(store.IsDBTabExist(std::string("oauth_log\0", 10)));
  expectError(store, 1, "unrecognized token: \"'oauth_log\"");
  EXPECT_THAT(log_.lines(), ElementsAre("3 oauth_db_basic.cpp Run Command failed!!"
                                        "[unrecognized token: \"'oauth_log\"][1]"));
}

TEST_F(TableExistsTest, IsFalseWhenTheLookUpFails) {
  OAUTHDBBasic store;
  const ExclusiveLock lock(files_.database());
  EXPECT_FALSE(store.IsDBTabExist("oauth_log"));
  expectError(store, 5, "database is locked");
  EXPECT_THAT(log_.lines(),
              ElementsAre("3 oauth_db_basic.cpp Run Command failed!![database is locked][5]"));
}

TEST_F(TableExistsTest, TracesATableThatExists) {
  withDiagnostics(8, [this] {
    OAUTHDBBasic store;
    log_.clear();
    EXPECT_TRUE(store.IsDBTabExist("oauth_log"));
  });
  EXPECT_THAT(log_.lines(), ElementsAre("3 oauth_db_basic.cpp ==> DBCmdRun[SELECT * FROM "
                                        "sqlite_master WHERE name='oauth_log' and type='table';]",
                                        "3 oauth_db_basic.cpp ==> IsTabExistCallback",
                                        "3 oauth_db_basic.cpp Tab[oauth_log] is exist"));
  EXPECT_THAT(log_.formats(),
              ElementsAre("%s:%d ==> %s[%s]", "%s:%d ==> %s", "%s:%d Tab[%s] is exist"));
}

TEST_F(TableExistsTest, TracesNothingMoreForAMissingTable) {
  withDiagnostics(15, [this] {
    OAUTHDBBasic store;
    log_.clear();
    EXPECT_FALSE(store.IsDBTabExist("none"));
  });
  EXPECT_THAT(log_.lines(), ElementsAre("3 oauth_db_basic.cpp ==> DBCmdRun[SELECT * FROM "
                                        "sqlite_master WHERE name='none' and type='table';]"));
}

class AddMetaDataTest : public LifecycleTest {};

TEST_F(AddMetaDataTest, AddsTheThreeRowsEveryTime) {
  OAUTHDBBasic store;
  store.AddMetaData();
  EXPECT_THAT(query("SELECT tab_name, version FROM oauth_meta"),
              ElementsAre("oauth_clientInfo|2", "oauth_grantCode|2", "oauth_token|2",
                          "oauth_clientInfo|2", "oauth_grantCode|2", "oauth_token|2"));
  expectError(store, 255, "");
  EXPECT_THAT(log_.lines(), IsEmpty());
}

TEST_F(AddMetaDataTest, ContinuesAfterARowThatCannotBeWritten) {
  OAUTHDBBasic store;
  execute(
      "DELETE FROM oauth_meta; CREATE TRIGGER no_codes BEFORE INSERT ON oauth_meta "
      "WHEN NEW.tab_name = 'oauth_grantCode' BEGIN SELECT RAISE(ABORT, 'no codes'); END");
  store.AddMetaData();
  EXPECT_THAT(query("SELECT tab_name FROM oauth_meta"),
              ElementsAre("oauth_clientInfo", "oauth_token"));
  expectError(store, 19, "no codes");
  EXPECT_THAT(log_.lines(), ElementsAre("3 oauth_db_basic.cpp Run Command failed!![no codes][19]",
                                        "3 oauth_db_basic.cpp Add Meta failed"));
  EXPECT_THAT(log_.formats(),
              ElementsAre("%s:%d Run Command failed!![%s][%d]", "%s:%d Add Meta failed"));
}

class DropTest : public LifecycleTest {};

TEST_F(DropTest, DropsTheTableOfTheStore) {
  OAUTHDBLog store("oauth_log");
  EXPECT_TRUE(store.DBDrop());
  EXPECT_THAT(query(kTables),
              ElementsAre("oauth_meta", "oauth_clientInfo", "oauth_token", "oauth_grantCode"));
  EXPECT_EQ(3, rowCount("oauth_meta"));
  expectError(store, 255, "");
  EXPECT_THAT(log_.lines(), IsEmpty());
}

TEST_F(DropTest, SucceedsWithoutTheTable) {
  OAUTHDBLog store("oauth_log");
  EXPECT_TRUE(store.DBDrop());
  EXPECT_TRUE(store.DBDrop());
  EXPECT_THAT(log_.lines(), IsEmpty());
}

TEST_F(DropTest, LeavesTheStoreReady) {
  OAUTHDBLog store("oauth_log");
  EXPECT_TRUE(store.DBDrop());
  expectReady(store);
}

TEST_F(DropTest, IsUndoneByTheNextInitialisation) {
  OAUTHDBLog store("oauth_log");
  EXPECT_TRUE(store.DBDrop());
  EXPECT_TRUE(store.DBInit());
  EXPECT_EQ(0, rowCount("oauth_log"));
}

TEST_F(DropTest, NeedsNoReadyStore) {
  { const OAUTHDBBasic first; }
  execute("DROP TABLE oauth_log");
  occupyName("oauth_log");
  OAUTHDBToken store("oauth_token");
  expectUnready(store, -1, "Create table failed");
  EXPECT_TRUE(store.DBDrop());
  EXPECT_EQ(-1, rowCount("oauth_token"));
}

TEST_F(DropTest, RefusesAStoreWithoutATable) {
  OAUTHDBBasic store;
  EXPECT_FALSE(store.DBDrop());
  expectError(store, 1, "near \";\": syntax error");
  EXPECT_THAT(log_.lines(), ElementsAre("3 oauth_db_basic.cpp Run Command failed!!"
                                        "[near \";\": syntax error][1]"));
}

TEST_F(DropTest, AddsNoLineOfItsOwnToAFailure) {
  OAUTHDBLog store("oauth_log");
  {
    const ExclusiveLock lock(files_.database());
    EXPECT_FALSE(store.DBDrop());
  }
  expectError(store, 5, "database is locked");
  EXPECT_THAT(log_.lines(),
              ElementsAre("3 oauth_db_basic.cpp Run Command failed!![database is locked][5]"));
  EXPECT_EQ(0, rowCount("oauth_log"));
}

TEST_F(DropTest, ReportsAFailureAsAResult) {
  withDiagnostics(1, [this] {
    OAUTHDBLog store("oauth_log");
    const ExclusiveLock lock(files_.database());
    log_.clear();
    EXPECT_FALSE(store.DBDrop());
  });
  EXPECT_THAT(log_.lines(),
              ElementsAre("3 oauth_db_basic.cpp Run Command failed!![database is locked][5]",
                          "3 oauth_db_basic.cpp Drop [oauth_log] failed"));
  EXPECT_THAT(log_.formats(),
              ElementsAre("%s:%d Run Command failed!![%s][%d]", "%s:%d Drop [%s] failed"));
}

TEST_F(DropTest, ReportsAFailureUnderNoOtherClass) {
  withDiagnostics(14, [this] {
    OAUTHDBLog store("oauth_log");
    const ExclusiveLock lock(files_.database());
    log_.clear();
    EXPECT_FALSE(store.DBDrop());
  });
  EXPECT_THAT(log_.lines(),
              ElementsAre("3 oauth_db_basic.cpp ==> DBDrop",
                          "3 oauth_db_basic.cpp ==> DBCmdRun[DROP TABLE IF EXISTS oauth_log;]",
                          "3 oauth_db_basic.cpp Run Command failed!![database is locked][5]"));
}

TEST_F(DropTest, ReportsNoSuccess) {
  withDiagnostics(15, [this] {
    OAUTHDBLog store("oauth_log");
    log_.clear();
    EXPECT_TRUE(store.DBDrop());
  });
  EXPECT_THAT(log_.lines(),
              ElementsAre("3 oauth_db_basic.cpp ==> DBDrop",
                          "3 oauth_db_basic.cpp ==> DBCmdRun[DROP TABLE IF EXISTS oauth_log;]"));
}

// --- Closing ---

class CloseTest : public LifecycleTest {};

TEST_F(CloseTest, ClosesTheConnection) {
  std::optional<OAUTHDBBasic> store;
  store.emplace();
  EXPECT_THAT(files_.calls(),
              ElementsAre("open /var/packages/Keyloft/target/etc/oauth.db", "busy_timeout 5000"));
  store.reset();
  EXPECT_THAT(files_.calls(), ElementsAre("open /var/packages/Keyloft/target/etc/oauth.db",
                                          "busy_timeout 5000", "close"));
  EXPECT_THAT(log_.lines(), IsEmpty());
}

TEST_F(CloseTest, ReportsAFailure) {
  files_.failClose(5);
  { const OAUTHDBBasic store; }
  EXPECT_THAT(log_.lines(), ElementsAre("3 oauth_db_basic.cpp Close DB failed!![5]"));
  EXPECT_THAT(log_.formats(), ElementsAre("%s:%d Close DB failed!![%d]"));
}

TEST_F(CloseTest, LeavesNothingBesideTheFile) {
  { const OAUTHDBBasic store; }
  std::vector<std::string> names;
  for (const auto& entry : std::filesystem::directory_iterator(files_.directory()))
    names.push_back(entry.path().filename());
  EXPECT_THAT(names, ElementsAre("oauth.db"));
}

// --- Raised privilege ---

class PrivilegeTest : public LifecycleTest {
 protected:
  void open() { store_.emplace(); }
  void close() { store_.reset(); }
  // errno after an open that fails without a handle, so that no other call follows.
  int errnoAfterOpening() {
    files_.openWithoutHandle(7);
    errno = EDOM;
    open();
    return errno;
  }
  int errnoAfterClosing() {
    errno = EDOM;
    close();
    return errno;
  }
  // Drops the calls and lines so far.
  void forgetOpening() {
    log_.clear();
    forgotten_ = ids_.calls().size();
  }
  std::vector<std::string> idCalls() const {
    return {ids_.calls().begin() + static_cast<std::ptrdiff_t>(forgotten_), ids_.calls().end()};
  }
  void expectIds(unsigned user, unsigned group) const {
    EXPECT_EQ(user, ids_.user());
    EXPECT_EQ(group, ids_.group());
  }

  ConnectionWatch connections_;
  std::optional<OAUTHDBBasic> store_;

 private:
  std::size_t forgotten_ = 0;
};

constexpr char kGroupRaised[] = "38 oauth_db_basic.cpp WARNING: setresgid(-1, 0, -1)";
constexpr char kUserRaised[] = "38 oauth_db_basic.cpp WARNING: setresuid(-1, 0, -1)";
constexpr char kEnterFailed[] = "35 oauth_db_basic.cpp ERROR: ENTERCriticalSection";
constexpr char kLeaveFailed[] = "35 oauth_db_basic.cpp ERROR: LEAVECriticalSection";

TEST_F(PrivilegeTest, IsLeftAloneForRoot) {
  open();
  close();
  EXPECT_THAT(ids_.calls(), IsEmpty());
  EXPECT_THAT(log_.lines(), IsEmpty());
  EXPECT_THAT(connections_.seen, ElementsAre("open as 0:0, errno 0", "close as 0:0"));
}

TEST_F(PrivilegeTest, RaisesTheGroupAloneForTheRootUser) {
  ids_.become(0, 500);
  open();
  EXPECT_THAT(ids_.calls(), ElementsAre("setresgid(-1, 0, -1)", "setresgid(-1, 500, -1)"));
  EXPECT_THAT(log_.lines(), ElementsAre(kGroupRaised));
  EXPECT_THAT(connections_.seen, ElementsAre("open as 0:0, errno 0"));
  expectIds(0, 500);
}

TEST_F(PrivilegeTest, RaisesTheUserAloneForTheRootGroup) {
  ids_.become(1000, 0);
  open();
  EXPECT_THAT(ids_.calls(), ElementsAre("setresuid(-1, 0, -1)", "setresuid(-1, 0, -1)",
                                        "setresuid(-1, 1000, -1)"));
  EXPECT_THAT(log_.lines(), ElementsAre(kUserRaised, kUserRaised));
  EXPECT_THAT(connections_.seen, ElementsAre("open as 0:0, errno 0"));
  expectIds(1000, 0);
}

TEST_F(PrivilegeTest, RaisesTheGroupFirstButRestoresTheUserLast) {
  ids_.become(1000, 500);
  open();
  EXPECT_THAT(ids_.calls(),
              ElementsAre("setresgid(-1, 0, -1)", "setresuid(-1, 0, -1)", "setresuid(-1, 0, -1)",
                          "setresgid(-1, 500, -1)", "setresuid(-1, 1000, -1)"));
  EXPECT_THAT(log_.lines(), ElementsAre(kGroupRaised, kUserRaised, kUserRaised));
  EXPECT_THAT(connections_.seen, ElementsAre("open as 0:0, errno 0"));
  expectIds(1000, 500);
}

TEST_F(PrivilegeTest, IsRaisedForClosingInTheSameWay) {
  ids_.become(1000, 500);
  open();
  forgetOpening();
  close();
  EXPECT_THAT(idCalls(),
              ElementsAre("setresgid(-1, 0, -1)", "setresuid(-1, 0, -1)", "setresuid(-1, 0, -1)",
                          "setresgid(-1, 500, -1)", "setresuid(-1, 1000, -1)"));
  EXPECT_THAT(log_.lines(), ElementsAre(kGroupRaised, kUserRaised, kUserRaised));
  EXPECT_THAT(connections_.seen, ElementsAre("open as 0:0, errno 0", "close as 0:0"));
  expectIds(1000, 500);
}

TEST_F(PrivilegeTest, SavesTheIdsAgainForClosing) {
  ids_.become(1000, 500);
  open();
  ids_.become(0, 700);
  forgetOpening();
  close();
  EXPECT_THAT(idCalls(), ElementsAre("setresgid(-1, 0, -1)", "setresgid(-1, 700, -1)"));
  expectIds(0, 700);
}

TEST_F(PrivilegeTest, KeepsTheFormatOfTheWarning) {
  ids_.become(0, 500);
  open();
  EXPECT_THAT(log_.formats(), ElementsAre("%s:%d WARNING: set%s(%d, %d, %d)"));
}

TEST_F(PrivilegeTest, LeavesTheUserAloneWhenTheGroupIsRefused) {
  ids_.become(1000, 500);
  ids_.refuse("setresgid(-1, 0, -1)", EPERM);
  open();
  EXPECT_THAT(ids_.calls(), ElementsAre("setresgid(-1, 0, -1)"));
  EXPECT_THAT(log_.lines(), ElementsAre("35 oauth_db_basic.cpp ERROR: setresgid(-1, 0, -1) "
                                        "[Operation not permitted]",
                                        kEnterFailed));
  EXPECT_THAT(connections_.seen, ElementsAre("open as 1000:500, errno 1"));
  expectIds(1000, 500);
}

TEST_F(PrivilegeTest, RestoresTheGroupWhenTheUserIsRefused) {
  ids_.become(1000, 500);
  ids_.refuse("setresuid(-1, 0, -1)", EAGAIN);
  open();
  EXPECT_THAT(ids_.calls(), ElementsAre("setresgid(-1, 0, -1)", "setresuid(-1, 0, -1)",
                                        "setresgid(-1, 500, -1)"));
  EXPECT_THAT(log_.lines(), ElementsAre(kGroupRaised,
                                        "35 oauth_db_basic.cpp ERROR: setresuid(-1, 0, -1) "
                                        "[Resource temporarily unavailable]",
                                        kEnterFailed));
  EXPECT_THAT(connections_.seen, ElementsAre("open as 1000:0, errno 1"));
  expectIds(1000, 500);
}

TEST_F(PrivilegeTest, IsNotNeededToOpenTheFile) {
  ids_.become(1000, 500);
  ids_.refuse("setresgid(-1, 0, -1)", EPERM);
  open();
  expectError(*store_, 255, "");
  expectReady(*store_);
}

TEST_F(PrivilegeTest, IsNotNeededToCloseTheFile) {
  ids_.become(1000, 500);
  open();
  ids_.refuse("setresgid(-1, 0, -1)", EPERM);
  forgetOpening();
  EXPECT_EQ(0, errnoAfterClosing());  // nothing was raised, so leaving succeeds
  EXPECT_THAT(idCalls(), ElementsAre("setresgid(-1, 0, -1)"));
  EXPECT_THAT(log_.lines(), ElementsAre("35 oauth_db_basic.cpp ERROR: setresgid(-1, 0, -1) "
                                        "[Operation not permitted]",
                                        kEnterFailed));
  EXPECT_THAT(connections_.seen, ElementsAre("open as 0:0, errno 0", "close as 1000:500"));
  expectIds(1000, 500);
}

TEST_F(PrivilegeTest, StopsLeavingWhenTheUserCannotBecomeRootAgain) {
  ids_.become(1000, 500);
  connections_.duringOpen = [this] { ids_.refuse("setresuid(-1, 0, -1)", EPERM); };
  open();
  EXPECT_THAT(ids_.calls(),
              ElementsAre("setresgid(-1, 0, -1)", "setresuid(-1, 0, -1)", "setresuid(-1, 0, -1)"));
  EXPECT_THAT(log_.lines(), ElementsAre(kGroupRaised, kUserRaised,
                                        "35 oauth_db_basic.cpp ERROR: setresuid(-1, 0, -1) "
                                        "[Operation not permitted]",
                                        kLeaveFailed));
  expectIds(0, 0);
  expectError(*store_, 255, "");
  expectReady(*store_);
}

TEST_F(PrivilegeTest, StopsLeavingWhenTheGroupCannotBeRestored) {
  ids_.become(1000, 500);
  ids_.refuse("setresgid(-1, 500, -1)", EINVAL);
  open();
  EXPECT_THAT(ids_.calls(), ElementsAre("setresgid(-1, 0, -1)", "setresuid(-1, 0, -1)",
                                        "setresuid(-1, 0, -1)", "setresgid(-1, 500, -1)"));
  EXPECT_THAT(log_.lines(), ElementsAre(kGroupRaised, kUserRaised, kUserRaised,
                                        "35 oauth_db_basic.cpp ERROR: setresgid(-1, 500, -1) "
                                        "[Invalid argument]",
                                        kLeaveFailed));
  expectIds(0, 0);
  expectReady(*store_);
}

TEST_F(PrivilegeTest, ReportsAUserThatCannotBeRestored) {
  ids_.become(1000, 500);
  ids_.refuse("setresuid(-1, 1000, -1)", EAGAIN);
  open();
  EXPECT_THAT(ids_.calls(),
              ElementsAre("setresgid(-1, 0, -1)", "setresuid(-1, 0, -1)", "setresuid(-1, 0, -1)",
                          "setresgid(-1, 500, -1)", "setresuid(-1, 1000, -1)"));
  EXPECT_THAT(log_.lines(), ElementsAre(kGroupRaised, kUserRaised, kUserRaised,
                                        "35 oauth_db_basic.cpp ERROR: setresuid(-1, 1000, -1) "
                                        "[Resource temporarily unavailable]",
                                        kLeaveFailed));
  expectIds(0, 500);
  expectReady(*store_);
}

TEST_F(PrivilegeTest, ReportsBothSequencesWhenBothFail) {
  ids_.become(1000, 500);
  ids_.refuse("setresuid(-1, 0, -1)", EPERM);
  ids_.refuse("setresgid(-1, 500, -1)", EPERM);
  open();
  EXPECT_THAT(log_.lines(), ElementsAre(kGroupRaised,
                                        "35 oauth_db_basic.cpp ERROR: setresuid(-1, 0, -1) "
                                        "[Operation not permitted]",
                                        kEnterFailed,
                                        "35 oauth_db_basic.cpp ERROR: setresgid(-1, 500, -1) "
                                        "[Operation not permitted]",
                                        kLeaveFailed));
  expectIds(1000, 0);
}

TEST_F(PrivilegeTest, ReportsAFailedRestoringAfterClosing) {
  ids_.become(1000, 500);
  open();
  ids_.refuse("setresgid(-1, 500, -1)", EPERM);
  forgetOpening();
  EXPECT_EQ(1, errnoAfterClosing());
  EXPECT_THAT(idCalls(), ElementsAre("setresgid(-1, 0, -1)", "setresuid(-1, 0, -1)",
                                     "setresuid(-1, 0, -1)", "setresgid(-1, 500, -1)"));
  EXPECT_THAT(log_.lines(), ElementsAre(kGroupRaised, kUserRaised, kUserRaised,
                                        "35 oauth_db_basic.cpp ERROR: setresgid(-1, 500, -1) "
                                        "[Operation not permitted]",
                                        kLeaveFailed));
}

TEST_F(PrivilegeTest, KeepsTheFormatsOfTheErrors) {
  ids_.become(1000, 500);
  ids_.refuse("setresuid(-1, 0, -1)", EPERM);
  ids_.refuse("setresgid(-1, 500, -1)", EPERM);
  open();
  EXPECT_THAT(
      log_.formats(),
      ElementsAre("%s:%d WARNING: set%s(%d, %d, %d)", "%s:%d ERROR: set%s(%d, %d, %d) [%s]",
                  "%s:%d ERROR: ENTERCriticalSection", "%s:%d ERROR: set%s(%d, %d, %d) [%s]",
                  "%s:%d ERROR: LEAVECriticalSection"));
}

// On leaving, the current ids are compared with the saved ones. A change to root is logged.
TEST_F(PrivilegeTest, ReturnsToRootWhenTheIdsWereDroppedMeanwhile) {
  connections_.duringOpen = [this] { ids_.become(7, 8); };
  open();
  EXPECT_THAT(ids_.calls(),
              ElementsAre("setresuid(-1, 0, -1)", "setresgid(-1, 0, -1)", "setresuid(-1, 0, -1)"));
  EXPECT_THAT(log_.lines(), ElementsAre(kUserRaised, kGroupRaised, kUserRaised));
  expectIds(0, 0);
}

TEST_F(PrivilegeTest, StopsLeavingAfterClosingWhenTheUserCannotBecomeRootAgain) {
  ids_.become(1000, 500);
  open();
  connections_.duringClose = [this] { ids_.refuse("setresuid(-1, 0, -1)", EPERM); };
  forgetOpening();
  EXPECT_EQ(1, errnoAfterClosing());
  EXPECT_THAT(log_.lines(), ElementsAre(kGroupRaised, kUserRaised,
                                        "35 oauth_db_basic.cpp ERROR: setresuid(-1, 0, -1) "
                                        "[Operation not permitted]",
                                        kLeaveFailed));
  expectIds(0, 0);
}

// syslog() may change errno.
TEST_F(PrivilegeTest, HasErrnoOneAfterARefusalWhateverTheLogLeaves) {
  ids_.become(1000, 500);
  log_.leaveErrno(EBADF);
  ids_.refuse("setresgid(-1, 0, -1)", EPERM);
  open();
  EXPECT_THAT(connections_.seen, ElementsAre("open as 1000:500, errno 1"));
}

TEST_F(PrivilegeTest, LeavesErrnoOneAfterAFailedRestoringWhateverTheLogLeaves) {
  ids_.become(1000, 500);
  open();
  log_.leaveErrno(EBADF);
  ids_.refuse("setresuid(-1, 1000, -1)", EAGAIN);
  EXPECT_EQ(1, errnoAfterClosing());
}

TEST_F(PrivilegeTest, LeavesErrnoZeroForRoot) { EXPECT_EQ(0, errnoAfterOpening()); }

TEST_F(PrivilegeTest, LeavesErrnoZeroAfterRestoring) {
  ids_.become(1000, 500);
  EXPECT_EQ(0, errnoAfterOpening());
}

TEST_F(PrivilegeTest, LeavesErrnoZeroAfterClosing) {
  open();
  EXPECT_EQ(0, errnoAfterClosing());
}

TEST_F(PrivilegeTest, LeavesErrnoOneAfterAFailedRestoring) {
  ids_.become(1000, 500);
  ids_.refuse("setresuid(-1, 1000, -1)", EAGAIN);
  EXPECT_EQ(1, errnoAfterOpening());
}

TEST_F(PrivilegeTest, IsRestoredBeforeAFailedOpenIsReported) {
  ids_.become(1000, 500);
  files_.openWithoutHandle(7);
  open();
  EXPECT_THAT(log_.lines(), ElementsAre(kGroupRaised, kUserRaised, kUserRaised,
                                        "3 oauth_db_basic.cpp Open DB failed!![7]"));
  expectIds(1000, 500);
}

TEST_F(PrivilegeTest, IsRestoredBeforeAFailedCloseIsReported) {
  ids_.become(1000, 500);
  files_.failClose(5);
  open();
  forgetOpening();
  close();
  EXPECT_THAT(log_.lines(), ElementsAre(kGroupRaised, kUserRaised, kUserRaised,
                                        "3 oauth_db_basic.cpp Close DB failed!![5]"));
  expectIds(1000, 500);
}

// --- A new file ---

TEST_F(PrivilegeTest, MakesANewFileForItsUserAlone) {
  const mode_t before = umask(0);
  open();
  umask(before);
  EXPECT_EQ(std::filesystem::perms::owner_read | std::filesystem::perms::owner_write,
            std::filesystem::status(files_.database()).permissions());
  EXPECT_THAT(log_.lines(), IsEmpty());
}

TEST_F(PrivilegeTest, MakesANewFileWritableUnderAnyUmask) {
  const mode_t before = umask(0777);
  open();
  umask(before);
  EXPECT_EQ(std::filesystem::perms(0600), std::filesystem::status(files_.database()).permissions());
  expectReady(*store_);
}

TEST_F(PrivilegeTest, GivesANewFileToTheProgramsOwnUser) {
  if (getuid() != 0) GTEST_SKIP() << "only root gives files away";
  ids_.become(1000, 500);
  open();
  struct stat status;
  ASSERT_EQ(0, stat(files_.database().c_str(), &status));
  EXPECT_EQ(1000U, status.st_uid);
  EXPECT_EQ(500U, status.st_gid);
}

TEST_F(PrivilegeTest, LeavesTheModeOfAnExistingFileAlone) {
  createDatabaseFile("");
  std::filesystem::permissions(files_.database(), std::filesystem::perms(0640));
  open();
  EXPECT_EQ(std::filesystem::perms(0640), std::filesystem::status(files_.database()).permissions());
}

TEST_F(PrivilegeTest, OpensAnExistingFileWithErrnoAsRaisingLeftIt) {
  createDatabaseFile("");
  open();
  EXPECT_THAT(connections_.seen, ElementsAre("open as 0:0, errno 0"));
}

// --- Something else in the file's place ---

TEST_F(PrivilegeTest, IsNotRaisedWhereALinkLies) {
  std::filesystem::create_symlink(files_.directory() + "/elsewhere", files_.database());
  ids_.become(1000, 500);
  open();
  EXPECT_THAT(idCalls(), IsEmpty());
  EXPECT_THAT(connections_.seen, ElementsAre("open as 1000:500, errno 0"));
  EXPECT_THAT(log_.lines(), IsEmpty());
  expectReady(*store_);
}

TEST_F(PrivilegeTest, IsNotRaisedWhereADirectoryLies) {
  std::filesystem::create_directory(files_.database());
  ids_.become(1000, 500);
  open();
  EXPECT_THAT(idCalls(), IsEmpty());
  EXPECT_THAT(connections_.seen, ElementsAre("open as 1000:500, errno 0"));
  expectUnready(*store_, -1, "Create table failed");
}

// The program's own user may not look into the directory.
TEST_F(PrivilegeTest, IsGivenUpAgainWhereOnlyRootSeesALink) {
  std::filesystem::create_symlink(files_.directory() + "/elsewhere", files_.database());
  ids_.become(1000, 500);
  files_.failNextLook(EACCES);
  open();
  EXPECT_THAT(idCalls(),
              ElementsAre("setresgid(-1, 0, -1)", "setresuid(-1, 0, -1)", "setresuid(-1, 0, -1)",
                          "setresgid(-1, 500, -1)", "setresuid(-1, 1000, -1)"));
  EXPECT_THAT(connections_.seen, ElementsAre("open as 1000:500, errno 0"));
}

// --- A transaction left open ---

// A roll-back deletes the files that the journal names, so it must not happen as root.
TEST_F(PrivilegeTest, IsNotRaisedForTheRollBackOfAnOpenTransaction) {
  open();
  EXPECT_TRUE(
      store_->DBCmd("BEGIN; INSERT INTO oauth_log VALUES(1, 'lost', 1);", nullptr, nullptr));
  ids_.become(1000, 500);
  connections_.seen.clear();
  forgetOpening();
  close();
  EXPECT_THAT(connections_.seen, ElementsAre("roll back as 1000:500", "close as 0:0"));
  EXPECT_THAT(log_.lines(), ElementsAre(kGroupRaised, kUserRaised, kUserRaised));
  EXPECT_EQ(0, rowCount("oauth_log"));
}

// --- A file that cannot be trusted ---

TEST_F(OpenFailureTest, RefusesToChangeTheTablesOfSqlite) {
  OAUTHDBBasic store;
  EXPECT_FALSE(
      store.DBCmd("PRAGMA writable_schema = ON; DELETE FROM sqlite_master;", nullptr, nullptr));
  expectError(store, 1, "table sqlite_master may not be modified");
  EXPECT_EQ(5, static_cast<int>(query(kTables).size()));
}

TEST_F(OpenFailureTest, DoesNotTrustFunctionsInViewsOrTriggers) {
  OAUTHDBBasic store;
  Json::Value rows;
  EXPECT_TRUE(store.DBCmd("PRAGMA trusted_schema;", OAUTHDBBasic::TabCountCallback, &rows));
  EXPECT_EQ("0", rows[0U].asString());
}

TEST_F(PrivilegeTest, IsNotRaisedForStatements) {
  ids_.become(1000, 500);
  open();
  forgetOpening();
  EXPECT_TRUE(store_->DBInit());
  EXPECT_TRUE(store_->DBCmd("SELECT 1;", nullptr, nullptr));
  EXPECT_THAT(idCalls(), IsEmpty());
}

}  // namespace
