#include "oauth_log.h"

#include <json/writer.h>

#include <functional>
#include <string>
#include <vector>

#include "store_test.h"

using testing::ElementsAre;
using testing::IsEmpty;
using ZEVOOAUTHSERVER::kErrCreateTable;
using ZEVOOAUTHSERVER::kErrNone;
using ZEVOOAUTHSERVER::OAUTHDBLog;

namespace {

class LogTest : public StoreTest {
 protected:
  static void createDatabase() { const OAUTHDBLog log("oauth_log"); }

  // Moves every row into the past, so that the next row has another timestamp.
  void ageRowsBy(int seconds) const {
    execute("UPDATE oauth_log SET timestamp = timestamp - " + std::to_string(seconds));
  }
  // Gives every row that is added from now on this timestamp.
  void stampInserts(int second) const {
    execute("DROP TRIGGER IF EXISTS stamp");
    execute(
        "CREATE TRIGGER stamp AFTER INSERT ON oauth_log BEGIN UPDATE oauth_log SET timestamp = " +
        std::to_string(second) + " WHERE id = NEW.id; END");
  }
  void refuse(const std::string& statement) const {
    execute("CREATE TRIGGER refusal BEFORE " + statement +
            " ON oauth_log BEGIN SELECT RAISE(ABORT, 'refused'); END");
  }
  void insertRow(int timestamp, const std::string& msg) const {
    execute("INSERT INTO oauth_log VALUES(" + std::to_string(timestamp) + ", '" + msg + "', NULL)");
  }
  Lines messages() const { return query("SELECT msg FROM oauth_log ORDER BY id"); }

  // What the body logs with this level mask on a store of its own.
  Lines traced(int mask, const std::function<void(OAUTHDBLog&)>& body) {
    withDiagnostics(mask, [&] {
      OAUTHDBLog log("oauth_log");
      log_.clear();
      body(log);
    });
    return log_.lines();
  }
};

// --- Add ---

class LogAddTest : public LogTest {};

TEST_F(LogAddTest, StampsTheRowWithTheDatabasesClock) {
  clock_.set(1);
  OAUTHDBLog log("oauth_log");
  const std::string before = query("SELECT strftime('%s','now')").front();
  EXPECT_EQ(1, log.Add("hello"));
  const std::string after = query("SELECT strftime('%s','now')").front();
  EXPECT_THAT(query("SELECT typeof(timestamp), msg, id, timestamp BETWEEN " + before + " AND " +
                    after + " FROM oauth_log"),
              ElementsAre("integer|hello|1|1"));
  EXPECT_THAT(log_.lines(), IsEmpty());
}

TEST_F(LogAddTest, KeepsAnEarlierErrorOnSuccess) {
  OAUTHDBLog log("oauth_log");
  recordEarlierError(log);
  EXPECT_EQ(1, log.Add("hello"));
  expectEarlierError(log);
}

TEST_F(LogAddTest, StoresMessagesOfAnyLength) {
  OAUTHDBLog log("oauth_log");
  for (const std::string& msg : {std::string(), times(5000), times(500000, 'b')}) {
    SCOPED_TRACE(msg.size());
    execute("DELETE FROM oauth_log");
    EXPECT_EQ(1, log.Add(msg));
    EXPECT_THAT(messages(), ElementsAre(msg));
  }
}

TEST_F(LogAddTest, StoresOtherTextAsGiven) {
  OAUTHDBLog log("oauth_log");
  const std::string msg = "caf\u00e9 100% a_b \\ \" %s\n\t;--";
  EXPECT_EQ(1, log.Add(msg));
  EXPECT_THAT(messages(), ElementsAre(msg));
}

TEST_F(LogAddTest, ReportsAFailedInsert) {
  OAUTHDBLog log("oauth_log");
  refuse("INSERT");
  EXPECT_EQ(0, log.Add("lost"));
  expectError(log, 19, "refused");
  EXPECT_THAT(log_.lines(), ElementsAre("3 oauth_db_basic.cpp Run Command failed!![refused][19]",
                                        "3 oauth_db_basic.cpp Add failed[oauth_log]"));
  EXPECT_THAT(messages(), IsEmpty());
}

// --- Rotation ---

class LogRotationTest : public LogTest {};

TEST_F(LogRotationTest, TrimsToTheNewestRowsInDifferentSeconds) {
  writeSettings(R"({"log_max": 3})");
  OAUTHDBLog log("oauth_log");
  for (const char* const msg : {"one", "two", "three", "four"}) {
    ageRowsBy(10);
    EXPECT_EQ(1, log.Add(msg));
  }
  EXPECT_THAT(messages(), ElementsAre("two", "three", "four"));
  EXPECT_THAT(log_.lines(), IsEmpty());
}

TEST_F(LogRotationTest, KeepsAsManyRowsAsTheCeiling) {
  writeSettings(R"({"log_max": 3})");
  OAUTHDBLog log("oauth_log");
  stampInserts(100);
  for (const char* const msg : {"one", "two", "three"}) EXPECT_EQ(1, log.Add(msg));
  EXPECT_THAT(messages(), ElementsAre("one", "two", "three"));
}

TEST_F(LogRotationTest, EmptiesATableFilledWithinOneSecond) {
  writeSettings(R"({"log_max": 3})");
  OAUTHDBLog log("oauth_log");
  stampInserts(100);
  for (const char* const msg : {"one", "two", "three", "four"}) EXPECT_EQ(1, log.Add(msg));
  EXPECT_THAT(messages(), IsEmpty());
  expectError(log, kErrNone, "");
  EXPECT_THAT(log_.lines(), IsEmpty());
}

TEST_F(LogRotationTest, DropsEveryRowOfTheSecondThatStraddlesTheCeiling) {
  writeSettings(R"({"log_max": 2})");
  OAUTHDBLog log("oauth_log");
  insertRow(10, "oldest");
  insertRow(20, "straddling");
  insertRow(20, "straddling too");
  stampInserts(30);
  EXPECT_EQ(1, log.Add("newest"));
  EXPECT_THAT(messages(), ElementsAre("newest"));
}

TEST_F(LogRotationTest, TrimsByTimeInsteadOfId) {
  writeSettings(R"({"log_max": 2})");
  OAUTHDBLog log("oauth_log");
  insertRow(300, "from the future");
  insertRow(200, "later");
  stampInserts(100);
  EXPECT_EQ(1, log.Add("earlier"));
  EXPECT_THAT(messages(), ElementsAre("from the future", "later"));
}

TEST_F(LogRotationTest, TrimsATableThatIsFarTooLarge) {
  writeSettings(R"({"log_max": 2})");
  OAUTHDBLog log("oauth_log");
  execute(
      "INSERT INTO oauth_log WITH RECURSIVE n(i) AS (SELECT 1 UNION ALL SELECT i + 1 FROM n "
      "WHERE i < 50) SELECT i, 'old', NULL FROM n");
  stampInserts(100);
  EXPECT_EQ(1, log.Add("new"));
  EXPECT_THAT(query("SELECT timestamp, msg FROM oauth_log ORDER BY id"),
              ElementsAre("50|old", "100|new"));
}

TEST_F(LogRotationTest, KeepsAThousandRowsUnlessToldOtherwise) {
  OAUTHDBLog log("oauth_log");
  execute(
      "INSERT INTO oauth_log WITH RECURSIVE n(i) AS (SELECT 1 UNION ALL SELECT i + 1 FROM n "
      "WHERE i < 1000) SELECT i, 'old', NULL FROM n");
  EXPECT_EQ(1, log.Add("new"));
  EXPECT_THAT(query("SELECT COUNT(*), MIN(timestamp) FROM oauth_log"), ElementsAre("1000|2"));
}

TEST_F(LogRotationTest, ReadsTheCeilingAfreshEveryTime) {
  OAUTHDBLog log("oauth_log");
  for (int second = 1; second <= 3; ++second) insertRow(second, "old");
  stampInserts(100);
  EXPECT_EQ(1, log.Add("first"));
  EXPECT_EQ(4, rowCount("oauth_log"));
  writeSettings(R"({"log_max": 1})");
  stampInserts(101);
  EXPECT_EQ(1, log.Add("second"));
  EXPECT_THAT(messages(), ElementsAre("second"));
}

TEST_F(LogRotationTest, TrimsTheTableOfTheStoresName) {
  createDatabase();
  writeSettings(R"({"log_max": 1})");
  execute(
      "CREATE TABLE copy(timestamp integer NOT NULL, msg text NOT NULL, id integer PRIMARY KEY)");
  insertRow(1, "untouched");
  insertRow(2, "untouched");
  OAUTHDBLog log("copy");
  execute("INSERT INTO copy VALUES(1, 'old', NULL)");
  EXPECT_EQ(1, log.Add("new"));
  EXPECT_THAT(query("SELECT msg FROM copy"), ElementsAre("new"));
  EXPECT_EQ(2, rowCount("oauth_log"));
}

TEST_F(LogRotationTest, FollowsAFailedInsertToo) {
  writeSettings(R"({"log_max": 1})");
  OAUTHDBLog log("oauth_log");
  insertRow(1, "old");
  insertRow(2, "newer");
  refuse("INSERT");
  EXPECT_EQ(0, log.Add("lost"));
  EXPECT_THAT(messages(), ElementsAre("newer"));
  expectError(log, 19, "refused");
  EXPECT_THAT(log_.lines(), ElementsAre("3 oauth_db_basic.cpp Run Command failed!![refused][19]",
                                        "3 oauth_db_basic.cpp Add failed[oauth_log]"));
}

TEST_F(LogRotationTest, DoesNotSpoilTheInsertsResult) {
  writeSettings(R"({"log_max": 1})");
  OAUTHDBLog log("oauth_log");
  insertRow(1, "old");
  refuse("DELETE");
  EXPECT_EQ(1, log.Add("new"));
  EXPECT_THAT(messages(), ElementsAre("old", "new"));
  expectError(log, 19, "refused");
  EXPECT_THAT(log_.lines(), ElementsAre("3 oauth_db_basic.cpp Run Command failed!![refused][19]"));
}

TEST_F(LogRotationTest, LogsItsFailureOnlyWithDiagnosticsOn) {
  OAUTHDBLog("oauth_log").Add("old");
  ageRowsBy(10);
  writeSettings(R"({"log_max": 1, "log_level": 0})");
  createDebugMarker();
  refuse("DELETE");
  onFreshThread([&] {
    OAUTHDBLog log("oauth_log");
    EXPECT_EQ(1, log.Add("new"));
    expectError(log, 19, "refused");
  });
  EXPECT_THAT(log_.lines(), ElementsAre("3 oauth_db_basic.cpp Run Command failed!![refused][19]",
                                        "3 oauth_log.cpp Log rotate failed"));
  EXPECT_THAT(log_.formats(),
              ElementsAre("%s:%d Run Command failed!![%s][%d]", "%s:%d Log rotate failed"));
}

TEST_F(LogRotationTest, FailsLikeTheInsertWithoutATable) {
  OAUTHDBLog log("oauth_log");
  execute("DROP TABLE oauth_log");
  EXPECT_EQ(0, log.Add("lost"));
  expectError(log, 1, "no such table: oauth_log");
  EXPECT_THAT(
      log_.lines(),
      ElementsAre("3 oauth_db_basic.cpp Run Command failed!![no such table: oauth_log][1]",
                  "3 oauth_db_basic.cpp Add failed[oauth_log]",
                  "3 oauth_db_basic.cpp Run Command failed!![no such table: oauth_log][1]"));
}

// --- Get ---

class LogGetTest : public LogTest {
 protected:
  LogGetTest() {
    createDatabase();
    insertRow(30, "alpha abc");
    insertRow(10, "beta");
    insertRow(20, "ABC gamma");
  }
  // The messages of the rows, in their order.
  static Lines found(const Json::Value& rows) {
    Lines result;
    for (const Json::Value& row : rows) result.push_back(row["msg"].asString());
    return result;
  }
  static Lines found(const std::string& keyword, const std::string& option) {
    OAUTHDBLog log("oauth_log");
    Json::Value rows;
    EXPECT_EQ(1, log.Get(keyword, option, &rows));
    return found(rows);
  }
};

TEST_F(LogGetTest, DeliversEveryColumnAsText) {
  OAUTHDBLog log("oauth_log");
  Json::Value rows("before");
  EXPECT_EQ(1, log.Get("beta", "", &rows));
  Json::Value expected;
  expected[0U]["timestamp"] = "10";
  expected[0U]["msg"] = "beta";
  expected[0U]["id"] = "2";
  EXPECT_EQ(expected, rows);
  EXPECT_THAT(log_.lines(), IsEmpty());
}

TEST_F(LogGetTest, ReadsEveryRowWithoutAKeyword) {
  EXPECT_THAT(found("", ""), ElementsAre("alpha abc", "beta", "ABC gamma"));
}

TEST_F(LogGetTest, FindsKeywordsWithinMessages) {
  EXPECT_THAT(found("abc", ""), ElementsAre("alpha abc", "ABC gamma"));
}

TEST_F(LogGetTest, OrdersByTheOption) {
  EXPECT_THAT(found("", "ORDER BY timestamp DESC LIMIT 2"), ElementsAre("alpha abc", "ABC gamma"));
}

TEST_F(LogGetTest, AppliesTheOptionToWhatTheKeywordFinds) {
  EXPECT_THAT(found("abc", "ORDER BY timestamp LIMIT 1"), ElementsAre("ABC gamma"));
}

TEST_F(LogGetTest, LetsWildcardsInTheKeywordMatch) {
  EXPECT_THAT(found("b_ta", ""), ElementsAre("beta"));
  EXPECT_THAT(found("a%c", ""), ElementsAre("alpha abc", "ABC gamma"));
}

TEST_F(LogGetTest, SucceedsWithoutARow) {
  OAUTHDBLog log("oauth_log");
  recordEarlierError(log);
  Json::Value rows("before");
  EXPECT_EQ(1, log.Get("nowhere", "", &rows));
  EXPECT_EQ(Json::Value(Json::arrayValue), rows);
  expectEarlierError(log);
  EXPECT_THAT(log_.lines(), IsEmpty());
}

TEST_F(LogGetTest, ComparesAQuoteInTheKeywordAsItIs) {
  insertRow(40, "O''Hara");
  EXPECT_THAT(found("O'Hara", ""), ElementsAre("O'Hara"));
  EXPECT_THAT(found("'; DELETE FROM oauth_log; --", ""), IsEmpty());
}

TEST_F(LogGetTest, FindsAWrittenQuoteByItsStoredPair) {
  OAUTHDBLog("oauth_log").Add("O'Hara");
  EXPECT_THAT(found("O'Hara", ""), IsEmpty());
  EXPECT_THAT(found("O''Hara", ""), ElementsAre("O''Hara"));
}

TEST_F(LogGetTest, EndsTheKeywordAtItsFirstNul) {
  EXPECT_THAT(found(std::string("beta\0'", 6), ""), ElementsAre("beta"));
}

TEST_F(LogGetTest, EndsTheOptionAtItsFirstNul) {
  EXPECT_THAT(found("", std::string("LIMIT 1\0 OFFSET 1", 17)), ElementsAre("alpha abc"));
}

TEST_F(LogGetTest, AcceptsKeywordsOfAnyLength) { EXPECT_THAT(found(times(20000), ""), IsEmpty()); }

TEST_F(LogGetTest, DoublesQuotesInTheOption) {
  EXPECT_THAT(found("", "ORDER BY msg = '' DESC LIMIT 1"), ElementsAre("alpha abc"));
  OAUTHDBLog log("oauth_log");
  Json::Value rows("before");
  EXPECT_EQ(0, log.Get("", "ORDER BY msg = 'beta' DESC", &rows));
  EXPECT_EQ(Json::Value(Json::arrayValue), rows);
  expectError(log, 1, "near \"beta\": syntax error");
  EXPECT_THAT(
      log_.lines(),
      ElementsAre("3 oauth_db_basic.cpp Run Command failed!![near \"beta\": syntax error][1]",
                  "3 oauth_db_basic.cpp Get failed[oauth_log]"));
}

// --- Del ---

class LogDelTest : public LogTest {};

TEST_F(LogDelTest, RemovesEveryRow) {
  OAUTHDBLog log("oauth_log");
  insertRow(1, "one");
  insertRow(2, "two");
  recordEarlierError(log);
  EXPECT_EQ(1, log.Del());
  EXPECT_THAT(messages(), IsEmpty());
  expectEarlierError(log);
  EXPECT_THAT(log_.lines(), IsEmpty());
}

TEST_F(LogDelTest, FailsOnAnEmptyTable) {
  OAUTHDBLog log("oauth_log");
  recordEarlierError(log);
  EXPECT_EQ(0, log.Del());
  expectEarlierError(log);
  EXPECT_THAT(log_.lines(), ElementsAre("3 oauth_db_basic.cpp Delete failed[oauth_log]"));
}

// --- Diagnostics ---

class LogTraceTest : public LogTest {};

TEST_F(LogTraceTest, AddTracesInsertBeforeRotation) {
  const Lines lines = traced(15, [](OAUTHDBLog& log) { EXPECT_EQ(1, log.Add("it's")); });
  EXPECT_THAT(
      lines,
      ElementsAre("3 oauth_log.cpp ==> Add", "3 oauth_db_basic.cpp ==> DBAdd",
                  "3 oauth_db_basic.cpp ==> GetInsertParam", "3 oauth_db_basic.cpp ==> DBCmd",
                  "3 oauth_db_basic.cpp ==> DBCmdRun[INSERT INTO oauth_log (id, msg, timestamp) "
                  "VALUES(NULL, 'it''''s', strftime('%s','now'));]",
                  "3 oauth_db_basic.cpp [oauth_log] Add success, changed[1]",
                  "3 oauth_db_basic.cpp ==> DBCmd",
                  "3 oauth_db_basic.cpp ==> DBCmdRun[DELETE FROM oauth_log WHERE timestamp IN "
                  "(SELECT timestamp FROM oauth_log ORDER BY timestamp DESC LIMIT -1 OFFSET "
                  "1000)]"));
}

TEST_F(LogTraceTest, RotationNamesTheLargestCeilingItAllows) {
  createDatabase();
  writeSettings(R"({"log_max": 10001, "log_level": 8})");
  createDebugMarker();
  onFreshThread([&] {
    OAUTHDBLog log("oauth_log");
    log_.clear();
    EXPECT_EQ(1, log.Add("hello"));
  });
  EXPECT_EQ(
      "3 oauth_db_basic.cpp ==> DBCmdRun[DELETE FROM oauth_log WHERE timestamp IN (SELECT "
      "timestamp FROM oauth_log ORDER BY timestamp DESC LIMIT -1 OFFSET 10000)]",
      log_.lines().back());
}

TEST_F(LogTraceTest, GetTracesEveryStep) {
  createDatabase();
  insertRow(10, "it''s");
  const Lines lines = traced(15, [](OAUTHDBLog& log) {
    Json::Value rows;
    EXPECT_EQ(1, log.Get("t's", "ORDER BY id", &rows));
  });
  EXPECT_THAT(lines,
              ElementsAre("3 oauth_log.cpp ==> Get", "3 oauth_db_basic.cpp ==> DBGet",
                          "3 oauth_db_basic.cpp ==> DBCmd",
                          "3 oauth_db_basic.cpp ==> DBCmdRun[SELECT * FROM oauth_log WHERE msg "
                          "like '%t''s%' ORDER BY id;]",
                          "3 oauth_db_basic.cpp ==> TabGetCallback",
                          "3 oauth_db_basic.cpp ##### [0][timestamp = 10]",
                          "3 oauth_db_basic.cpp ##### [1][msg = it's]",
                          "3 oauth_db_basic.cpp ##### [2][id = 1]",
                          "3 oauth_db_basic.cpp ClientInfo Get Done"));
}

TEST_F(LogTraceTest, EmptyGetReadsWithoutACondition) {
  const Lines lines = traced(8, [](OAUTHDBLog& log) {
    Json::Value rows;
    EXPECT_EQ(1, log.Get("", "", &rows));
  });
  EXPECT_THAT(lines, ElementsAre("3 oauth_log.cpp ==> Get", "3 oauth_db_basic.cpp ==> DBGet",
                                 "3 oauth_db_basic.cpp ==> GetConditionParam",
                                 "3 oauth_db_basic.cpp ==> DBCmd",
                                 "3 oauth_db_basic.cpp ==> DBCmdRun[SELECT * FROM oauth_log ;]"));
}

TEST_F(LogTraceTest, DelTracesEveryStep) {
  createDatabase();
  insertRow(1, "one");
  insertRow(2, "two");
  const Lines lines = traced(15, [](OAUTHDBLog& log) { EXPECT_EQ(1, log.Del()); });
  EXPECT_THAT(lines, ElementsAre("3 oauth_log.cpp ==> Del", "3 oauth_db_basic.cpp ==> DBDel",
                                 "3 oauth_db_basic.cpp ==> GetConditionParam",
                                 "3 oauth_db_basic.cpp ==> DBCmd",
                                 "3 oauth_db_basic.cpp ==> DBCmdRun[DELETE FROM oauth_log;]",
                                 "3 oauth_db_basic.cpp ClientInfo Delete success, changed[2]"));
}

// --- A store that could not be opened ---

class UnopenedLogTest : public LogTest {};

TEST_F(UnopenedLogTest, RefusesToAdd) {
  files_.removeDirectory();
  OAUTHDBLog log("oauth_log");
  log_.clear();
  EXPECT_EQ(0, log.Add("lost"));
  EXPECT_THAT(log_.lines(), ElementsAre("3 oauth_db_basic.cpp DB is not ready!!",
                                        "3 oauth_db_basic.cpp Add failed[oauth_log]",
                                        "3 oauth_db_basic.cpp DB is not ready!!"));
  expectError(log, kErrCreateTable, "Create table failed");
}

TEST_F(UnopenedLogTest, LogsTheFailedRotationOnlyWithDiagnosticsOn) {
  files_.openWithoutHandle(14);
  const Lines lines = traced(0, [](OAUTHDBLog& log) {
    EXPECT_EQ(0, log.Add("lost"));
    expectError(log, 14, "Open DB failed!!");
  });
  EXPECT_THAT(lines, ElementsAre("3 oauth_db_basic.cpp DB is not ready!!",
                                 "3 oauth_db_basic.cpp Add failed[oauth_log]",
                                 "3 oauth_db_basic.cpp DB is not ready!!",
                                 "3 oauth_log.cpp Log rotate failed"));
}

}  // namespace
