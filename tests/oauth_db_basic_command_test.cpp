#include "oauth_db_basic.h"

#include <climits>

#include "json_text.h"
#include "oauth_clientInfo.h"
#include "oauth_log.h"
#include "store_test.h"

using testing::ElementsAre;
using testing::IsEmpty;
using ZEVOOAUTHSERVER::kErrBadParameters;
using ZEVOOAUTHSERVER::OAUTHDBBasic;
using ZEVOOAUTHSERVER::OAUTHDBClientInfo;
using ZEVOOAUTHSERVER::OAUTHDBLog;

namespace {

Json::Value array() { return {Json::arrayValue}; }

struct Column {
  const char* name;
  const char* value;  // null for an SQL NULL
};

// Calls a row callback as SQLite does.
int deliver(const std::vector<Column>& row, OAUTHDBBasic::RowCallback callback,
            Json::Value* document) {
  std::vector<char*> names, values;
  for (const Column& column : row) {
    names.push_back(const_cast<char*>(column.name));
    values.push_back(const_cast<char*>(column.value));
  }
  return callback(document, static_cast<int>(row.size()), values.data(), names.data());
}

class CommandTest : public StoreTest {
 protected:
  // The next store finds the file usable but cannot create its last table.
  void preventReadiness() const {
    execute("CREATE TABLE occupied(a); CREATE INDEX oauth_log ON occupied(a)");
  }
  void addLogRows(int count) const {
    execute("WITH RECURSIVE n(i) AS (SELECT 1 UNION ALL SELECT i + 1 FROM n WHERE i < " +
            std::to_string(count) +
            ") INSERT INTO oauth_log(timestamp, msg) SELECT 1700000000, 'row' FROM n");
  }
  // The rows of a statement, read by TabGetCallback().
  static std::string read(OAUTHDBBasic& store, const std::string& sql) {
    Json::Value rows = array();
    EXPECT_TRUE(store.DBCmd(sql, OAUTHDBBasic::TabGetCallback, &rows)) << sql;
    return text(rows);
  }
};

// --- Running a statement ---

class RunTest : public CommandTest {
 protected:
  OAUTHDBBasic store_;
};

TEST_F(RunTest, LeavesTheErrorStateAloneOnSuccess) {
  EXPECT_TRUE(store_.DBCmdRun("SELECT 1;", nullptr, nullptr));
  expectError(store_, 255, "");
  EXPECT_THAT(log_.lines(), IsEmpty());
}

TEST_F(RunTest, NeverClearsAnEarlierError) {
  EXPECT_FALSE(store_.DBCmdRun("NONSENSE", nullptr, nullptr));
  EXPECT_TRUE(store_.DBCmdRun("SELECT 1;", nullptr, nullptr));
  EXPECT_TRUE(store_.DBCmd("SELECT 1;", nullptr, nullptr));
  expectError(store_, 1, "near \"NONSENSE\": syntax error");
}

TEST_F(RunTest, ReplacesAnEarlierErrorByALaterOne) {
  EXPECT_FALSE(store_.DBCmdRun("NONSENSE", nullptr, nullptr));
  EXPECT_FALSE(store_.DBCmdRun("SELECT * FROM missing", nullptr, nullptr));
  expectError(store_, 1, "no such table: missing");
}

TEST_F(RunTest, ReportsASyntaxErrorInTheWordsOfTheDatabase) {
  EXPECT_FALSE(store_.DBCmdRun("NONSENSE", nullptr, nullptr));
  expectError(store_, 1, "near \"NONSENSE\": syntax error");
  EXPECT_THAT(log_.lines(), ElementsAre("3 oauth_db_basic.cpp Run Command failed!!"
                                        "[near \"NONSENSE\": syntax error][1]"));
  EXPECT_THAT(log_.formats(), ElementsAre("%s:%d Run Command failed!![%s][%d]"));
}

TEST_F(RunTest, ReportsAConstraintByItsCode) {
  EXPECT_FALSE(store_.DBCmdRun("INSERT INTO oauth_log(msg) VALUES('m')", nullptr, nullptr));
  expectError(store_, 19, "NOT NULL constraint failed: oauth_log.timestamp");
  EXPECT_THAT(log_.lines(), ElementsAre("3 oauth_db_basic.cpp Run Command failed!!"
                                        "[NOT NULL constraint failed: oauth_log.timestamp][19]"));
  EXPECT_EQ(0, rowCount("oauth_log"));
}

TEST_F(RunTest, RunsEveryStatementOfTheText) {
  EXPECT_TRUE(store_.DBCmdRun(
      "INSERT INTO oauth_log VALUES(1,'one',1); INSERT INTO oauth_log VALUES(2,'two',2)", nullptr,
      nullptr));
  EXPECT_THAT(query("SELECT msg FROM oauth_log"), ElementsAre("one", "two"));
}

TEST_F(RunTest, KeepsWhatRanBeforeAFailure) {
  Json::Value rows;
  EXPECT_FALSE(store_.DBCmdRun("SELECT 'kept' AS a; NONSENSE; SELECT 'never' AS a",
                               OAUTHDBBasic::TabGetCallback, &rows));
  EXPECT_EQ(R"([{"a":"kept"}])", text(rows));
  expectError(store_, 1, "near \"NONSENSE\": syntax error");
}

TEST_F(RunTest, TakesAnEmptyTextForASuccess) {
  EXPECT_TRUE(store_.DBCmdRun("", nullptr, nullptr));
  EXPECT_TRUE(store_.DBCmdRun(" -- nothing", nullptr, nullptr));
  EXPECT_THAT(log_.lines(), IsEmpty());
}

TEST_F(RunTest, EndsTheStatementAtANulByte) {
  EXPECT_TRUE(store_.DBCmdRun(std::string("SELECT 1;\0NONSENSE", 18), nullptr, nullptr));
  EXPECT_THAT(log_.lines(), IsEmpty());
}

TEST_F(RunTest, NeedsNoCallback) {
  Json::Value rows = "untouched";
  EXPECT_TRUE(store_.DBCmdRun("SELECT 1;", nullptr, &rows));
  EXPECT_EQ(R"("untouched")", text(rows));
}

TEST_F(RunTest, NeedsNoResult) {
  for (const OAUTHDBBasic::RowCallback callback :
       {OAUTHDBBasic::IsTabExistCallback, OAUTHDBBasic::TabCountCallback,
        OAUTHDBBasic::TabGetCallback})
    EXPECT_TRUE(store_.DBCmdRun("SELECT 'a' AS client_id;", callback, nullptr));
  expectError(store_, 255, "");
}

TEST_F(RunTest, CallsBackForEveryRow) {
  const auto count = [](void* context, int, char**, char**) {
    Json::Value& calls = *static_cast<Json::Value*>(context);
    calls = calls.asInt() + 1;
    return 0;
  };
  Json::Value calls = 0;
  EXPECT_TRUE(store_.DBCmdRun("SELECT 1 UNION ALL SELECT 2 UNION ALL SELECT 3", count, &calls));
  EXPECT_EQ(3, calls.asInt());
}

TEST_F(RunTest, FailsWhenTheCallbackRefusesARow) {
  const auto refuse = [](void*, int, char**, char**) { return 1; };
  EXPECT_FALSE(store_.DBCmdRun("SELECT 1", refuse, nullptr));
  expectError(store_, 4, "query aborted");
  EXPECT_THAT(log_.lines(),
              ElementsAre("3 oauth_db_basic.cpp Run Command failed!![query aborted][4]"));
}

TEST_F(RunTest, PrintsPercentSignsOfAnErrorAsTheyAre) {
  EXPECT_FALSE(store_.DBCmdRun("SELECT * FROM \"100%s%n\"", nullptr, nullptr));
  expectError(store_, 1, "no such table: 100%s%n");
  EXPECT_THAT(log_.lines(),
              ElementsAre("3 oauth_db_basic.cpp Run Command failed!![no such table: 100%s%n][1]"));
}

TEST_F(RunTest, KeepsALongErrorWhole) {
  const std::string name = times(20000, 'n');
  EXPECT_FALSE(store_.DBCmdRun("SELECT * FROM " + name, nullptr, nullptr));
  expectError(store_, 1, "no such table: " + name);
  EXPECT_THAT(
      log_.lines(),
      ElementsAre("3 oauth_db_basic.cpp Run Command failed!![no such table: " + name + "][1]"));
}

TEST_F(RunTest, TracesTheWholeStatement) {
  const std::string sql = "SELECT '" + times(5000, 'v') + "', '%s%n';";
  withDiagnostics(8, [this, &sql] {
    OAUTHDBBasic store;
    log_.clear();
    EXPECT_TRUE(store.DBCmdRun(sql, nullptr, nullptr));
  });
  EXPECT_THAT(log_.lines(), ElementsAre("3 oauth_db_basic.cpp ==> DBCmdRun[" + sql + "]"));
  EXPECT_THAT(log_.formats(), ElementsAre("%s:%d ==> %s[%s]"));
}

TEST_F(RunTest, NamesTheSourceFileWithoutItsFolders) {
  EXPECT_FALSE(store_.DBCmdRun("NONSENSE", nullptr, nullptr));
  ASSERT_EQ(1U, log_.lines().size());
  const std::string line = log_.lines().front();
  EXPECT_EQ("3 oauth_db_basic.cpp", line.substr(0, line.find(" Run")));
}

// --- Readiness ---

class ReadinessTest : public CommandTest {};

TEST_F(ReadinessTest, LetsAReadyStoreRunStatements) {
  OAUTHDBLog store("oauth_log");
  EXPECT_TRUE(store.DBCmd("INSERT INTO oauth_log VALUES(1,'m',1)", nullptr, nullptr));
  EXPECT_EQ(1, rowCount("oauth_log"));
  EXPECT_THAT(log_.lines(), IsEmpty());
}

TEST_F(ReadinessTest, PassesOnTheFailureOfAStatement) {
  OAUTHDBLog store("oauth_log");
  EXPECT_FALSE(store.DBCmd("NONSENSE", nullptr, nullptr));
  expectError(store, 1, "near \"NONSENSE\": syntax error");
  EXPECT_THAT(log_.lines(), ElementsAre("3 oauth_db_basic.cpp Run Command failed!!"
                                        "[near \"NONSENSE\": syntax error][1]"));
}

TEST_F(ReadinessTest, RefusesAStoreThatIsNotReady) {
  preventReadiness();
  OAUTHDBLog store("oauth_log");
  log_.clear();
  Json::Value rows = "untouched";
  EXPECT_FALSE(store.DBCmd("CREATE TABLE never(a)", OAUTHDBBasic::TabGetCallback, &rows));
  EXPECT_EQ(R"("untouched")", text(rows));
  EXPECT_EQ(-1, rowCount("never"));
  expectError(store, -1, "Create table failed");
  EXPECT_THAT(log_.lines(), ElementsAre("3 oauth_db_basic.cpp DB is not ready!!"));
  EXPECT_THAT(log_.formats(), ElementsAre("%s:%d DB is not ready!!"));
}

TEST_F(ReadinessTest, KeepsWhateverErrorWasRecordedBefore) {
  preventReadiness();
  OAUTHDBLog store("oauth_log");
  store.SetErrCode(42);
  store.SetErrMsg("earlier");
  EXPECT_FALSE(store.DBCmd("SELECT 1;", nullptr, nullptr));
  expectError(store, 42, "earlier");
}

TEST_F(ReadinessTest, RefusesAStoreWithoutAHandle) {
  files_.openWithoutHandle(7);
  OAUTHDBLog store("oauth_log");
  log_.clear();
  EXPECT_FALSE(store.DBCmd("SELECT 1;", nullptr, nullptr));
  expectError(store, 7, "Open DB failed!!");
  EXPECT_THAT(log_.lines(), ElementsAre("3 oauth_db_basic.cpp DB is not ready!!"));
}

TEST_F(ReadinessTest, DoesNotMatterForRunningDirectly) {
  preventReadiness();
  OAUTHDBLog store("oauth_log");
  EXPECT_TRUE(store.DBCmdRun("CREATE TABLE made(a)", nullptr, nullptr));
  EXPECT_EQ(0, rowCount("made"));
}

TEST_F(ReadinessTest, RecordsAnEmptyMessageWhereTheDatabaseHasNone) {
  files_.removeDirectory();
  OAUTHDBLog store("oauth_log");
  log_.clear();
  EXPECT_FALSE(store.DBCmdRun("SELECT 1;", nullptr, nullptr));
  expectError(store, 21, "");
  EXPECT_THAT(log_.lines(), ElementsAre("3 oauth_db_basic.cpp Run Command failed!![][21]"));
}

TEST_F(ReadinessTest, TracesARefusalWithoutTheStatement) {
  withDiagnostics(15, [this] {
    files_.openWithoutHandle(7);
    OAUTHDBLog store("oauth_log");
    log_.clear();
    EXPECT_FALSE(store.DBCmd("SELECT 1;", nullptr, nullptr));
  });
  EXPECT_THAT(log_.lines(), ElementsAre("3 oauth_db_basic.cpp ==> DBCmd",
                                        "3 oauth_db_basic.cpp DB is not ready!!"));
}

// --- The general row reader ---

class RowReaderTest : public CommandTest {
 protected:
  OAUTHDBBasic store_;
};

TEST_F(RowReaderTest, ReadsEveryValueAsAString) {
  execute("INSERT INTO oauth_log VALUES(1700000000, 'message', 5)");
  EXPECT_EQ(R"([{"id":"5","msg":"message","timestamp":"1700000000"}])",
            read(store_, "SELECT * FROM oauth_log"));
}

TEST_F(RowReaderTest, KeepsTheOrderOfTheRows) {
  EXPECT_EQ(R"([{"a":"2"},{"a":"1"},{"a":"3"}])",
            read(store_, "SELECT 2 AS a UNION ALL SELECT 1 UNION ALL SELECT 3"));
}

TEST_F(RowReaderTest, LeavesTheArrayEmptyWithoutARow) {
  EXPECT_EQ("[]", read(store_, "SELECT * FROM oauth_log"));
}

TEST_F(RowReaderTest, AppendsToTheRowsThatAreThere) {
  Json::Value rows = array();
  rows.append("first");
  EXPECT_TRUE(store_.DBCmd("SELECT 1 AS a", OAUTHDBBasic::TabGetCallback, &rows));
  EXPECT_EQ(R"(["first",{"a":"1"}])", text(rows));
}

TEST_F(RowReaderTest, MakesAnArrayOfANullDocument) {
  Json::Value rows;
  EXPECT_TRUE(store_.DBCmd("SELECT 1 AS a", OAUTHDBBasic::TabGetCallback, &rows));
  EXPECT_EQ(R"([{"a":"1"}])", text(rows));
}

TEST_F(RowReaderTest, NamesMembersAsTheStatementDoes) {
  EXPECT_EQ(R"json([{"COUNT(*)":"0","m":"x"}])json",
            read(store_, "SELECT COUNT(*), 'x' AS m FROM oauth_log"));
}

struct Delivered {
  const char* expression;
  const char* value;
};

TEST_F(RowReaderTest, KeepsTheTextOfTheDatabase) {
  const Delivered rows[] = {
      {"5", "5"},
      {"-1", "-1"},
      {"9223372036854775807", "9223372036854775807"},
      {"-9223372036854775808", "-9223372036854775808"},
      {"1.5", "1.5"},
      {"'007'", "007"},
      {"' padded '", " padded "},
      {"''", ""},
      {"'it''s'", "it's"},
      {"'it''''s'", "it''s"},
      {"'100%_'", "100%_"},
      {"'\xC3\xA4\xE6\xBC\xA2\xF0\x9F\x94\x91'", "\xC3\xA4\xE6\xBC\xA2\xF0\x9F\x94\x91"},
      {"'a' || char(10) || 'b'", "a\nb"},
      {"CAST(X'610062' AS TEXT)", "a"},  // ends at its first NUL byte
      {"NULL", ""},
  };
  for (const Delivered& row : rows) {
    SCOPED_TRACE(row.expression);
    Json::Value result = array();
    EXPECT_TRUE(store_.DBCmd(std::string("SELECT ") + row.expression + " AS v",
                             OAUTHDBBasic::TabGetCallback, &result));
    ASSERT_EQ(1U, result.size());
    EXPECT_TRUE(result[0U]["v"].isString());
    EXPECT_EQ(row.value, result[0U]["v"].asString());
  }
}

TEST_F(RowReaderTest, KeepsALongValueWhole) {
  EXPECT_EQ("[{\"v\":\"" + times(300000, 'v') + "\"}]",
            read(store_, "SELECT '" + times(300000, 'v') + "' AS v"));
}

TEST_F(RowReaderTest, ReadsANullColumnAsEmptyBesideOthers) {
  EXPECT_EQ(R"([{"a":"","b":"x"}])", read(store_, "SELECT NULL AS a, 'x' AS b"));
}

TEST_F(RowReaderTest, LetsTheLastOfTwoColumnsOfOneNameWin) {
  EXPECT_EQ(R"([{"a":"2"}])", read(store_, "SELECT 1 AS a, 2 AS a"));
}

TEST_F(RowReaderTest, DecryptsWhatIsSensitive) {
  EXPECT_EQ(R"([{"client_id":"abc","client_secret":"xyz","scope":"sealed:cba"}])",
            read(store_,
                 "SELECT 'sealed:cba' AS client_id, 'sealed:zyx' AS client_secret, "
                 "'sealed:cba' AS scope"));
  EXPECT_THAT(host_.calls(), ElementsAre("decrypt sealed:cba 1024", "decrypt sealed:zyx 1024"));
}

TEST_F(RowReaderTest, ShowsAStoredClientInPlain) {
  OAUTHDBClientInfo clients("oauth_clientInfo");
  Json::Value result;
  EXPECT_EQ(1, clients.Add(times(64, 'c'), times(64, 's'), "uri", "read", "Name", "1", result));
  EXPECT_THAT(query("SELECT client_id, client_secret FROM oauth_clientInfo"),
              ElementsAre("sealed:" + times(64, 'c') + "|sealed:" + times(64, 's')));
  EXPECT_EQ("[{\"client_id\":\"" + times(64, 'c') + "\",\"client_secret\":\"" + times(64, 's') +
                "\",\"display_name\":\"Name\",\"enable\":\"1\",\"id\":\"1\","
                "\"redirect_uri\":\"uri\",\"scope\":\"read\"}]",
            read(clients, "SELECT * FROM oauth_clientInfo"));
}

TEST_F(RowReaderTest, DeliversARowThatCannotBeDecrypted) {
  EXPECT_EQ(R"([{"client_id":"plain","client_secret":"sealed:zyx"}])",
            read(store_, "SELECT 'plain' AS client_id, 'sealed:zyx' AS client_secret"));
  expectError(store_, 255, "");
  EXPECT_THAT(log_.lines(), ElementsAre("3 oauth_db_basic.cpp Data Decrypt failed",
                                        "3 oauth_db_basic.cpp Decrypt data failed"));
  EXPECT_THAT(log_.formats(),
              ElementsAre("%s:%d Data Decrypt failed", "%s:%d Decrypt data failed"));
}

TEST_F(RowReaderTest, DeliversARowAsFarAsItWasDecrypted) {
  EXPECT_EQ(R"([{"client_id":"abc","client_secret":"plain"}])",
            read(store_, "SELECT 'sealed:cba' AS client_id, 'plain' AS client_secret"));
  expectError(store_, 255, "");
  EXPECT_THAT(log_.lines(), ElementsAre("3 oauth_db_basic.cpp Data Decrypt failed",
                                        "3 oauth_db_basic.cpp Decrypt data failed"));
}

TEST_F(RowReaderTest, ReadsOnAfterARowThatCannotBeDecrypted) {
  EXPECT_EQ(R"([{"client_id":"one"},{"client_id":"plain"},{"client_id":"three"}])",
            read(store_,
                 "SELECT 'sealed:eno' AS client_id UNION ALL SELECT 'plain' "
                 "UNION ALL SELECT 'sealed:eerht'"));
  EXPECT_THAT(log_.lines(), ElementsAre("3 oauth_db_basic.cpp Data Decrypt failed",
                                        "3 oauth_db_basic.cpp Decrypt data failed"));
}

TEST_F(RowReaderTest, DumpsTheColumnsInTheirOrder) {
  withDiagnostics(2, [this] {
    OAUTHDBBasic store;
    log_.clear();
    EXPECT_EQ(R"([{"a":"","b":"x"},{"a":"1","b":"100%s"}])",
              read(store, "SELECT 'x' AS b, NULL AS a UNION ALL SELECT '100%s', 1"));
  });
  EXPECT_THAT(log_.lines(), ElementsAre("3 oauth_db_basic.cpp ##### [0][b = x]",
                                        "3 oauth_db_basic.cpp ##### [1][a = ]",
                                        "3 oauth_db_basic.cpp ##### [0][b = 100%s]",
                                        "3 oauth_db_basic.cpp ##### [1][a = 1]"));
  EXPECT_THAT(log_.formats(),
              ElementsAre("%s:%d ##### [%d][%s = %s]", "%s:%d ##### [%d][%s = %s]",
                          "%s:%d ##### [%d][%s = %s]", "%s:%d ##### [%d][%s = %s]"));
}

TEST_F(RowReaderTest, DumpsNothingUnderOtherClasses) {
  withDiagnostics(5, [this] {
    OAUTHDBBasic store;
    log_.clear();
    EXPECT_EQ(R"([{"a":"1"}])", read(store, "SELECT 1 AS a"));
  });
  EXPECT_THAT(log_.lines(), IsEmpty());
}

TEST_F(RowReaderTest, TracesAWholeReadInItsOrder) {
  withDiagnostics(15, [this] {
    OAUTHDBBasic store;
    log_.clear();
    EXPECT_EQ(R"([{"client_id":"abc","client_secret":"plain"}])",
              read(store, "SELECT 'plain' AS client_secret, 'sealed:cba' AS client_id;"));
  });
  EXPECT_THAT(log_.lines(),
              ElementsAre("3 oauth_db_basic.cpp ==> DBCmd",
                          "3 oauth_db_basic.cpp ==> DBCmdRun[SELECT 'plain' AS client_secret, "
                          "'sealed:cba' AS client_id;]",
                          "3 oauth_db_basic.cpp ==> TabGetCallback",
                          "3 oauth_db_basic.cpp ##### [0][client_secret = plain]",
                          "3 oauth_db_basic.cpp ##### [1][client_id = sealed:cba]",
                          "3 oauth_db_basic.cpp ==> ParamDecrypt[client_id]",
                          "3 oauth_db_basic.cpp ==> ParamDecrypt[client_secret]",
                          "3 oauth_db_basic.cpp Data Decrypt failed",
                          "3 oauth_db_basic.cpp Decrypt data failed"));
}

// --- Row callbacks by themselves ---

class CallbackTest : public CommandTest {};

TEST_F(CallbackTest, AnswersZeroSoThatReadingGoesOn) {
  for (const OAUTHDBBasic::RowCallback callback :
       {OAUTHDBBasic::IsTabExistCallback, OAUTHDBBasic::TabCountCallback,
        OAUTHDBBasic::TabGetCallback}) {
    Json::Value document;
    EXPECT_EQ(0, deliver({{"a", "1"}, {"b", nullptr}}, callback, &document));
    EXPECT_EQ(0, deliver({{"a", "1"}, {"b", nullptr}}, callback, nullptr));
  }
  EXPECT_THAT(log_.lines(), IsEmpty());
}

TEST_F(CallbackTest, AnswersZeroForARowThatCannotBeDecrypted) {
  Json::Value rows;
  EXPECT_EQ(0, deliver({{"client_id", "plain"}}, OAUTHDBBasic::TabGetCallback, &rows));
  EXPECT_EQ(R"([{"client_id":"plain"}])", text(rows));
  EXPECT_THAT(log_.lines(), ElementsAre("3 oauth_db_basic.cpp Data Decrypt failed",
                                        "3 oauth_db_basic.cpp Decrypt data failed"));
}

TEST_F(CallbackTest, ReadsANullColumnAsEmpty) {
  Json::Value rows;
  deliver({{"a", nullptr}, {"b", "x"}}, OAUTHDBBasic::TabGetCallback, &rows);
  EXPECT_EQ(R"([{"a":"","b":"x"}])", text(rows));
}

TEST_F(CallbackTest, CountsANullColumnAsEmpty) {
  Json::Value counts;
  deliver({{"a", nullptr}}, OAUTHDBBasic::TabCountCallback, &counts);
  EXPECT_EQ(R"([""])", text(counts));
}

TEST_F(CallbackTest, CountsByTheFirstColumnOfEveryRow) {
  Json::Value counts;
  deliver({{"n", "17"}, {"m", "18"}}, OAUTHDBBasic::TabCountCallback, &counts);
  deliver({{"n", "19"}}, OAUTHDBBasic::TabCountCallback, &counts);
  EXPECT_EQ(R"(["17","19"])", text(counts));
}

TEST_F(CallbackTest, MarksExistenceForAnyRow) {
  Json::Value probe;
  probe["exist"] = false;
  probe["other"] = "kept";
  deliver({{"a", nullptr}}, OAUTHDBBasic::IsTabExistCallback, &probe);
  EXPECT_EQ(R"({"exist":true,"other":"kept"})", text(probe));
}

TEST_F(CallbackTest, LeavesTheProbeAloneWithoutARow) {
  OAUTHDBBasic store;
  Json::Value probe;
  probe["exist"] = false;
  EXPECT_TRUE(store.DBCmd("SELECT * FROM oauth_log", OAUTHDBBasic::IsTabExistCallback, &probe));
  EXPECT_EQ(R"({"exist":false})", text(probe));
}

TEST_F(CallbackTest, DumpsTheRowThatMarksExistence) {
  withDiagnostics(10, [] {
    Json::Value probe;
    deliver({{"a", "1"}, {"b", nullptr}}, OAUTHDBBasic::IsTabExistCallback, &probe);
  });
  EXPECT_THAT(log_.lines(), ElementsAre("3 oauth_db_basic.cpp ==> IsTabExistCallback",
                                        "3 oauth_db_basic.cpp ##### [0][a = 1]",
                                        "3 oauth_db_basic.cpp ##### [1][b = ]"));
}

TEST_F(CallbackTest, DumpsNoCountedRow) {
  withDiagnostics(15, [] {
    Json::Value counts;
    deliver({{"n", "17"}}, OAUTHDBBasic::TabCountCallback, &counts);
  });
  EXPECT_THAT(log_.lines(), ElementsAre("3 oauth_db_basic.cpp ==> TabCountCallback"));
  EXPECT_THAT(log_.formats(), ElementsAre("%s:%d ==> %s"));
}

TEST_F(CallbackTest, DumpsARowThatNobodyReceives) {
  withDiagnostics(2, [] { deliver({{"a", "1"}}, OAUTHDBBasic::TabGetCallback, nullptr); });
  EXPECT_THAT(log_.lines(), ElementsAre("3 oauth_db_basic.cpp ##### [0][a = 1]"));
}

// A document of the wrong kind makes the JSON library throw. SQLite is C, so the exception must not
// pass through it: the statement fails instead.
struct Misfit {
  const char* name;
  OAUTHDBBasic::RowCallback callback;
  Json::Value document;
};

void PrintTo(const Misfit& misfit, std::ostream* out) { *out << misfit.name; }

class MisfitTest : public CommandTest, public testing::WithParamInterface<Misfit> {};

TEST_P(MisfitTest, FailsTheStatement) {
  OAUTHDBBasic store;
  Json::Value document = GetParam().document;
  EXPECT_FALSE(store.DBCmd("SELECT 1 AS a", GetParam().callback, &document));
  EXPECT_EQ(GetParam().document, document);
  expectError(store, 4, "query aborted");
  EXPECT_THAT(log_.lines(),
              ElementsAre("3 oauth_db_basic.cpp Run Command failed!![query aborted][4]"));
}

TEST_P(MisfitTest, LeavesTheStoreUsable) {
  OAUTHDBBasic store;
  Json::Value document = GetParam().document;
  EXPECT_FALSE(store.DBCmd("SELECT 1 AS a", GetParam().callback, &document));
  EXPECT_EQ(R"([{"a":"1"}])", read(store, "SELECT 1 AS a"));
}

INSTANTIATE_TEST_SUITE_P(
    Documents, MisfitTest,
    testing::Values(
        Misfit{"reader, string", OAUTHDBBasic::TabGetCallback, "text"},
        Misfit{"reader, number", OAUTHDBBasic::TabGetCallback, 5},
        Misfit{"reader, object", OAUTHDBBasic::TabGetCallback, Json::Value(Json::objectValue)},
        Misfit{"counter, string", OAUTHDBBasic::TabCountCallback, "text"},
        Misfit{"counter, object", OAUTHDBBasic::TabCountCallback, Json::Value(Json::objectValue)},
        Misfit{"probe, string", OAUTHDBBasic::IsTabExistCallback, "text"},
        Misfit{"probe, array", OAUTHDBBasic::IsTabExistCallback, Json::Value(Json::arrayValue)}));

// --- Counting rows ---

class RowCountTest : public CommandTest {
 protected:
  OAUTHDBLog store_{"oauth_log"};
};

TEST_F(RowCountTest, IsZeroForAnEmptyTable) {
  Json::Value count;
  EXPECT_TRUE(store_.DBGetRowCount(&count));
  EXPECT_EQ(R"(["0"])", text(count));
}

TEST_F(RowCountTest, IsDecimalText) {
  addLogRows(17);
  Json::Value count;
  EXPECT_TRUE(store_.DBGetRowCount(&count));
  EXPECT_EQ(R"(["17"])", text(count));
  expectError(store_, 255, "");
  EXPECT_THAT(log_.lines(), IsEmpty());
}

TEST_F(RowCountTest, ConcernsTheTableOfTheStore) {
  addLogRows(2);
  store_.SetTabName("oauth_meta");
  Json::Value count;
  EXPECT_TRUE(store_.DBGetRowCount(&count));
  EXPECT_EQ(R"(["3"])", text(count));
}

TEST_F(RowCountTest, ReplacesWhateverTheResultHeld) {
  Json::Value object;
  object["old"] = "value";
  Json::Value rows = array();
  rows.append("9");
  for (const Json::Value& before : {object, rows, Json::Value("text"), Json::Value(5)}) {
    Json::Value count = before;
    EXPECT_TRUE(store_.DBGetRowCount(&count)) << before;
    EXPECT_EQ(R"(["0"])", text(count)) << before;
  }
}

TEST_F(RowCountTest, LeavesAnEmptyArrayWhenTheStatementFails) {
  EXPECT_TRUE(store_.DBDrop());
  Json::Value count = "old";
  EXPECT_FALSE(store_.DBGetRowCount(&count));
  EXPECT_EQ("[]", text(count));
  expectError(store_, 1, "no such table: oauth_log");
  EXPECT_THAT(log_.lines(),
              ElementsAre("3 oauth_db_basic.cpp Run Command failed!![no such table: oauth_log][1]",
                          "3 oauth_db_basic.cpp Get Row Count failed[oauth_log]"));
  EXPECT_THAT(log_.formats(),
              ElementsAre("%s:%d Run Command failed!![%s][%d]", "%s:%d Get Row Count failed[%s]"));
}

TEST_F(RowCountTest, RefusesANullResult) {
  EXPECT_FALSE(store_.DBGetRowCount(nullptr));
  expectError(store_, kErrBadParameters, "Bad parameters");
  EXPECT_THAT(log_.lines(), ElementsAre("3 oauth_db_basic.cpp Bad parameters"));
}

TEST_F(RowCountTest, EndsTheTableNameAtANulByte) {
  store_.SetTabName(std::string("oauth_meta\0oauth_log", 20));
  Json::Value count;
  EXPECT_TRUE(store_.DBGetRowCount(&count));
  EXPECT_EQ(R"(["3"])", text(count));
}

TEST_F(RowCountTest, TracesItsSteps) {
  withDiagnostics(15, [this] {
    OAUTHDBLog store("oauth_log");
    log_.clear();
    Json::Value count;
    EXPECT_TRUE(store.DBGetRowCount(&count));
  });
  EXPECT_THAT(
      log_.lines(),
      ElementsAre("3 oauth_db_basic.cpp ==> DBGetRowCount", "3 oauth_db_basic.cpp ==> DBCmd",
                  "3 oauth_db_basic.cpp ==> DBCmdRun[SELECT COUNT(*) FROM oauth_log;]",
                  "3 oauth_db_basic.cpp ==> TabCountCallback"));
}

class UnreadyRowCountTest : public CommandTest {
 protected:
  void SetUp() override { preventReadiness(); }
};

TEST_F(UnreadyRowCountTest, LeavesAnEmptyArray) {
  OAUTHDBLog store("oauth_log");
  log_.clear();
  Json::Value count = "old";
  EXPECT_FALSE(store.DBGetRowCount(&count));
  EXPECT_EQ("[]", text(count));
  expectError(store, -1, "Create table failed");
  EXPECT_THAT(log_.lines(), ElementsAre("3 oauth_db_basic.cpp DB is not ready!!",
                                        "3 oauth_db_basic.cpp Get Row Count failed[oauth_log]"));
}

TEST_F(UnreadyRowCountTest, CountsAsFull) {
  OAUTHDBLog store("oauth_log");
  log_.clear();
  EXPECT_FALSE(store.DBCheckRowMax(1000));
  expectError(store, -1, "Create table failed");
  EXPECT_THAT(log_.lines(), ElementsAre("3 oauth_db_basic.cpp DB is not ready!!",
                                        "3 oauth_db_basic.cpp Get Row Count failed[oauth_log]",
                                        "3 oauth_db_basic.cpp Check Row Max failed[oauth_log]"));
  EXPECT_THAT(log_.formats(),
              ElementsAre("%s:%d DB is not ready!!", "%s:%d Get Row Count failed[%s]",
                          "%s:%d Check Row Max failed[%s]"));
}

// --- The row ceiling ---

struct Ceiling {
  int rows;
  unsigned long max;
  bool room;
};

void PrintTo(const Ceiling& ceiling, std::ostream* out) {
  *out << ceiling.rows << " rows of " << ceiling.max;
}

class CeilingTest : public CommandTest, public testing::WithParamInterface<Ceiling> {};

TEST_P(CeilingTest, LeavesRoomBelowTheCeilingOnly) {
  OAUTHDBLog store("oauth_log");
  if (GetParam().rows > 0) addLogRows(GetParam().rows);
  EXPECT_EQ(GetParam().room, store.DBCheckRowMax(GetParam().max));
  EXPECT_EQ(GetParam().rows, rowCount("oauth_log"));
  expectError(store, 255, "");
  EXPECT_THAT(log_.lines(), IsEmpty());
}

INSTANTIATE_TEST_SUITE_P(Tables, CeilingTest,
                         testing::Values(Ceiling{0, 0, false}, Ceiling{1, 0, false},
                                         Ceiling{0, 1, true}, Ceiling{1, 1, false},
                                         Ceiling{2, 1, false}, Ceiling{999, 1000, true},
                                         Ceiling{1000, 1000, false}, Ceiling{1001, 1000, false},
                                         Ceiling{1, ULONG_MAX, true}));

class RowMaxTest : public CommandTest {};

TEST_F(RowMaxTest, TakesATableThatCannotBeCountedForFull) {
  OAUTHDBLog store("oauth_log");
  EXPECT_TRUE(store.DBDrop());
  EXPECT_FALSE(store.DBCheckRowMax(ULONG_MAX));
  expectError(store, 1, "no such table: oauth_log");
  EXPECT_THAT(log_.lines(),
              ElementsAre("3 oauth_db_basic.cpp Run Command failed!![no such table: oauth_log][1]",
                          "3 oauth_db_basic.cpp Get Row Count failed[oauth_log]",
                          "3 oauth_db_basic.cpp Check Row Max failed[oauth_log]"));
}

TEST_F(RowMaxTest, ReportsTheCountAsAResult) {
  withDiagnostics(1, [this] {
    OAUTHDBLog store("oauth_log");
    addLogRows(17);
    log_.clear();
    EXPECT_FALSE(store.DBCheckRowMax(17));
  });
  EXPECT_THAT(log_.lines(), ElementsAre("3 oauth_db_basic.cpp Table Row Count[17]"));
  EXPECT_THAT(log_.formats(), ElementsAre("%s:%d Table Row Count[%lu]"));
}

TEST_F(RowMaxTest, DumpsNoRow) {
  withDiagnostics(6, [this] {
    OAUTHDBLog store("oauth_log");
    log_.clear();
    EXPECT_TRUE(store.DBCheckRowMax(17));
  });
  EXPECT_THAT(log_.lines(), IsEmpty());
}

TEST_F(RowMaxTest, TracesItsSteps) {
  withDiagnostics(15, [this] {
    OAUTHDBLog store("oauth_log");
    log_.clear();
    EXPECT_TRUE(store.DBCheckRowMax(1000));
  });
  EXPECT_THAT(
      log_.lines(),
      ElementsAre("3 oauth_db_basic.cpp ==> DBCheckRowMax",
                  "3 oauth_db_basic.cpp ==> DBGetRowCount", "3 oauth_db_basic.cpp ==> DBCmd",
                  "3 oauth_db_basic.cpp ==> DBCmdRun[SELECT COUNT(*) FROM oauth_log;]",
                  "3 oauth_db_basic.cpp ==> TabCountCallback",
                  "3 oauth_db_basic.cpp Table Row Count[0]"));
}

TEST_F(RowMaxTest, TracesNoCountAfterAFailure) {
  withDiagnostics(15, [this] {
    files_.openWithoutHandle(7);
    OAUTHDBLog store("oauth_log");
    log_.clear();
    EXPECT_FALSE(store.DBCheckRowMax(1000));
  });
  EXPECT_THAT(log_.lines(), ElementsAre("3 oauth_db_basic.cpp ==> DBCheckRowMax",
                                        "3 oauth_db_basic.cpp ==> DBGetRowCount",
                                        "3 oauth_db_basic.cpp ==> DBCmd",
                                        "3 oauth_db_basic.cpp DB is not ready!!",
                                        "3 oauth_db_basic.cpp Get Row Count failed[oauth_log]",
                                        "3 oauth_db_basic.cpp Check Row Max failed[oauth_log]"));
}

}  // namespace
