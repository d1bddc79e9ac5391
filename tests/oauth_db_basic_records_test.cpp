
#include <optional>
#include <stdexcept>

#include "json_text.h"
#include "oauth_db_basic.h"
#include "oauth_token.h"
#include "store_test.h"

using testing::ElementsAre;
using testing::IsEmpty;
using ZEVOOAUTHSERVER::kErrBadParameters;
using ZEVOOAUTHSERVER::kErrCrypt;
using ZEVOOAUTHSERVER::OAUTHDBBasic;
using ZEVOOAUTHSERVER::OAUTHDBToken;

namespace {

constexpr const char* kTables[] = {"oauth_clientInfo", "oauth_grantCode", "oauth_token",
                                   "oauth_log"};

// A store of a table t(id, name, scope, timestamp). Documents are written as JSON. sent_ is the
// last document after the operation, rows_ the result of the last read.
class RecordsTest : public StoreTest {
 protected:
  RecordsTest() {
    open();
    execute(
        "CREATE TABLE t(id integer PRIMARY KEY, name text NOT NULL DEFAULT '', "
        "scope text NOT NULL DEFAULT '', timestamp integer NOT NULL DEFAULT 0)");
  }
  void open() {
    store_.emplace();
    store_->SetTabName("t");
    log_.clear();
  }

  bool add(const std::string& record) { return store_->DBAdd(sent_ = parse(record)); }
  bool del(const std::string& request) { return store_->DBDel(sent_ = parse(request)); }
  bool get(const std::string& request) { return store_->DBGet(sent_ = parse(request), &rows_); }
  bool edit(const std::string& request) { return store_->DBEdit(sent_ = parse(request)); }
  bool run(const std::string& operation, const std::string& document) {
    if (operation == "DBAdd") return add(document);
    if (operation == "DBDel") return del(document);
    if (operation == "DBGet") return get(document);
    return edit(document);
  }
  // The statements that the operation runs.
  std::vector<std::string> statements(const std::string& operation, const std::string& document) {
    log_.clear();
    withDiagnostics(8, [&] { run(operation, document); });
    const std::string beginning = "3 oauth_db_basic.cpp ==> DBCmdRun[";
    std::vector<std::string> found;
    for (const std::string& line : log_.lines())
      if (line.rfind(beginning, 0) == 0)
        found.push_back(line.substr(beginning.size(), line.size() - beginning.size() - 1));
    return found;
  }

  std::vector<std::string> names() const { return query("SELECT name FROM t ORDER BY id"); }
  void addNames(const std::vector<std::string>& all) const {
    for (const std::string& name : all) execute("INSERT INTO t(name) VALUES('" + name + "')");
  }
  // Replaces one of the library's tables by one that has ids only.
  void simplify(const std::string& table) {
    execute("DROP TABLE " + table + "; CREATE TABLE " + table + "(id integer PRIMARY KEY)");
    store_->SetTabName(table);
    log_.clear();
  }

  void recordError(int code, const std::string& msg) {
    store_->SetErrCode(code);
    store_->SetErrMsg(msg);
  }
  void expectError(int code, const std::string& msg) const {
    EXPECT_EQ(code, store_->GetErrCode());
    EXPECT_EQ(msg, store_->GetErrMsg());
  }
  // These lines and no others.
  void expectLog(const std::vector<std::string>& texts) const {
    std::vector<std::string> lines;
    lines.reserve(texts.size());
    for (const std::string& text : texts) lines.push_back("3 oauth_db_basic.cpp " + text);
    EXPECT_EQ(lines, log_.lines());
  }
  // The error is the database's, and the operation logs its own line after it.
  void expectFailure(int code, const std::string& msg, const std::string& text) const {
    expectError(code, msg);
    expectLog({"Run Command failed!![" + msg + "][" + std::to_string(code) + "]", text});
  }
  void expectNoFailure() const {
    expectError(255, "");
    expectLog({});
  }

  std::optional<OAUTHDBBasic> store_;
  Json::Value sent_, rows_;
};

// --- Statements ---

struct Case {
  const char* operation;
  const char* document;
  const char* expected;
};

constexpr Case kStatements[] = {
    {"DBAdd", R"({"name": "O'Hara", "id": null, "timestamp": null})",
     "INSERT INTO t (id, name, timestamp) VALUES(NULL, 'O''Hara', strftime('%s','now'));"},
    {"DBAdd", R"({"client_secret": "xyz", "client_id": "abc", "scope": "a b"})",
     "INSERT INTO t (client_id, client_secret, scope) VALUES('sealed:cba', 'sealed:zyx', 'a b');"},
    {"DBAdd", "{}", "INSERT INTO t () VALUES();"},
    {"DBDel", R"({"condition": {"code": "x1", "client_id": "abc"}})",
     "DELETE FROM t WHERE client_id='sealed:cba' and code='x1';"},
    {"DBDel", R"({"condition": {"id": 5}})", "DELETE FROM t WHERE id='5';"},
    {"DBDel", R"({"condition": {}})", "DELETE FROM t;"},
    {"DBDel", "{}", "DELETE FROM t;"},
    {"DBDel", R"({"condition": {"id": 5}, "condition_like": "0", "option": "LIMIT 1"})",
     "DELETE FROM t WHERE id='5';"},
    {"DBGet", R"({"condition": {"a": "b"}})", "SELECT * FROM t WHERE a='b' ;"},
    {"DBGet", R"({"condition": {"client_id": "abc", "id": 5}})",
     "SELECT * FROM t WHERE client_id='sealed:cba' and id='5' ;"},
    {"DBGet", "{}", "SELECT * FROM t ;"},
    {"DBGet", R"({"condition": {}, "option": "ORDER BY id DESC"})",
     "SELECT * FROM t ORDER BY id DESC;"},
    {"DBGet", R"({"option": ""})", "SELECT * FROM t ;"},
    {"DBGet", R"({"condition_like": "scope like '%read%'", "option": "ORDER BY id DESC LIMIT 10"})",
     "SELECT * FROM t WHERE scope like '%read%' ORDER BY id DESC LIMIT 10;"},
    {"DBGet", R"({"condition": {"id": 5}, "condition_like": "name like '%a%'"})",
     "SELECT * FROM t WHERE name like '%a%' ;"},
    {"DBGet", R"({"condition_like": ""})", "SELECT * FROM t WHERE  ;"},
    {"DBEdit",
     R"({"modified": {"scope": "a b", "enable": "0"}, "condition": {"client_id": "abc"}})",
     "UPDATE t SET enable='0', scope='a b' WHERE client_id='sealed:cba';"},
    {"DBEdit", R"({"modified": {"client_secret": "xyz"}, "condition": {"id": 5}})",
     "UPDATE t SET client_secret='sealed:zyx' WHERE id='5';"},
    {"DBEdit", R"({"modified": {"name": "x"}})", "UPDATE t SET name='x';"},
    {"DBEdit", R"({"modified": {}, "condition": {"id": 5}})", "UPDATE t SET  WHERE id='5';"},
    {"DBEdit", "{}", "UPDATE t SET ;"},
    {"DBEdit", R"({"modified": {"name": "x"}, "condition_like": "0", "option": "LIMIT 1"})",
     "UPDATE t SET name='x';"},
};

TEST_F(RecordsTest, AreOneStatementEach) {
  for (const Case& row : kStatements)
    EXPECT_THAT(statements(row.operation, row.document), ElementsAre(row.expected))
        << row.operation << " " << row.document;
}

// --- The caller's document ---

constexpr Case kRewritings[] = {
    {"DBAdd", R"({"client_id":"abc","client_secret":"xyz","scope":"a"})",
     R"({"client_id":"sealed:cba","client_secret":"sealed:zyx","scope":"a"})"},
    {"DBDel", "{}", R"({"condition":null})"},
    {"DBDel", R"({"client_id":"abc"})", R"({"client_id":"abc","condition":null})"},
    {"DBDel", R"({"condition":{"client_id":"abc"},"modified":{"client_id":"abc"}})",
     R"({"condition":{"client_id":"sealed:cba"},"modified":{"client_id":"abc"}})"},
    {"DBGet", "{}", R"({"condition":null})"},
    {"DBGet", R"({"condition":{"client_id":"abc"},"modified":{"client_id":"abc"}})",
     R"({"condition":{"client_id":"sealed:cba"},"modified":{"client_id":"abc"}})"},
    {"DBGet", R"({"condition_like":"client_id like '%abc%'"})",
     R"({"condition":null,"condition_like":"client_id like '%abc%'"})"},
    {"DBEdit", "{}", R"({"condition":null,"modified":null})"},
    {"DBEdit", R"({"condition":{"client_id":"abc"},"modified":{"client_secret":"xyz"}})",
     R"({"condition":{"client_id":"sealed:cba"},"modified":{"client_secret":"sealed:zyx"}})"},
};

TEST_F(RecordsTest, RewriteTheDocument) {
  for (const Case& row : kRewritings) {
    run(row.operation, row.document);
    EXPECT_EQ(row.expected, text(sent_)) << row.operation << " " << row.document;
  }
}

// --- Failures of every operation ---

struct Refusal {
  const char* operation;
  const char* before;
  int call;  // of the cipher, the one that is refused
  const char* msg;
  const char* after;
};

// Callers know a failed read by its text, though it is the encryption that failed.
constexpr Refusal kRefusals[] = {
    {"DBAdd", R"({"client_id":"a","client_secret":"b"})", 1, "Data Encrypt failed",
     R"({"client_id":"a","client_secret":"b"})"},
    {"DBAdd", R"({"client_id":"a","client_secret":"b"})", 2, "Data Encrypt failed",
     R"({"client_id":"sealed:a","client_secret":"b"})"},
    {"DBDel", R"({"condition":{"client_id":"a"}})", 1, "Data Encrypt failed",
     R"({"condition":{"client_id":"a"}})"},
    {"DBGet", R"({"condition":{"client_id":"a"}})", 1, "Data Decrypt failed",
     R"({"condition":{"client_id":"a"}})"},
    {"DBGet", R"({"condition":{"client_id":"a"},"condition_like":"1"})", 1, "Data Decrypt failed",
     R"({"condition":{"client_id":"a"},"condition_like":"1"})"},
    {"DBEdit", R"({"condition":{"client_id":"a"},"modified":{"client_id":"b"}})", 1,
     "Data Encrypt failed", R"({"condition":{"client_id":"a"},"modified":{"client_id":"b"}})"},
    {"DBEdit", R"({"condition":{"client_id":"a"},"modified":{"client_id":"b"}})", 2,
     "Data Encrypt failed",
     R"({"condition":{"client_id":"sealed:a"},"modified":{"client_id":"b"}})"},
};

TEST_F(RecordsTest, FailOnARefusedEncryption) {
  addNames({"one", "two"});
  for (const Refusal& row : kRefusals) {
    SCOPED_TRACE(std::string(row.operation) + " " + row.before);
    recordError(255, "");
    log_.clear();
    host_.failEncrypt(row.call);
    EXPECT_FALSE(run(row.operation, row.before));
    expectError(kErrCrypt, row.msg);
    expectLog({"Data Encrypt failed"});
    EXPECT_EQ(row.after, text(sent_));
    EXPECT_THAT(names(), ElementsAre("one", "two"));
  }
}

TEST_F(RecordsTest, RunNothingAfterARefusedEncryption) {
  for (const Refusal& row : kRefusals) {
    host_.failEncrypt(row.call);
    EXPECT_THAT(statements(row.operation, row.before), IsEmpty()) << row.operation;
  }
}

struct Failure {
  const char* operation;
  const char* document;
  const char* text;
  const char* format;
};

constexpr Failure kFailures[] = {
    {"DBAdd", R"({"name": "x"})", "Add failed[missing]", "%s:%d Add failed[%s]"},
    {"DBDel", "{}", "Delete failed[missing]", "%s:%d Delete failed[%s]"},
    {"DBGet", "{}", "Get failed[missing]", "%s:%d Get failed[%s]"},
    {"DBEdit", R"({"modified": {"name": "x"}})", "Edit failed[missing]", "%s:%d Edit failed[%s]"},
};

TEST_F(RecordsTest, FailWithTheStatement) {
  store_->SetTabName("missing");
  for (const Failure& row : kFailures) {
    SCOPED_TRACE(row.operation);
    log_.clear();
    EXPECT_FALSE(run(row.operation, row.document));
    expectFailure(1, "no such table: missing", row.text);
    EXPECT_THAT(log_.formats(), ElementsAre("%s:%d Run Command failed!![%s][%d]", row.format));
  }
}

struct NoMatch {
  const char* table;
  const char* operation;
  const char* document;
  const char* text;
};

constexpr NoMatch kNoMatches[] = {
    {"t", "DBDel", R"({"condition": {"id": 4}})", "Delete failed[t]"},
    {"t", "DBDel", R"({"condition": {"name": "x' OR '1'='1"}})", "Delete failed[t]"},
    {"oauth_clientInfo", "DBDel", R"({"condition": {"client_id": "nobody"}})",
     "Delete failed[oauth_clientInfo]"},
    {"oauth_log", "DBDel", "{}", "Delete failed[oauth_log]"},  // which is empty
    {"t", "DBEdit", R"({"modified": {"name": "x"}, "condition": {"id": 4}})", "Edit failed[t]"},
    {"oauth_log", "DBEdit", R"({"modified": {"msg": "x"}})", "Edit failed[oauth_log]"},
};

TEST_F(RecordsTest, LeaveTheErrorStateWhenTheyFailWithoutAMatch) {
  addNames({"one", "two", "three"});
  recordError(-5, "earlier");
  for (const NoMatch& row : kNoMatches) {
    SCOPED_TRACE(std::string(row.operation) + " " + row.document);
    log_.clear();
    store_->SetTabName(row.table);
    EXPECT_FALSE(run(row.operation, row.document));
    expectError(-5, "earlier");
    expectLog({row.text});
    EXPECT_THAT(names(), ElementsAre("one", "two", "three"));
  }
}

TEST_F(RecordsTest, FailOnAStoreThatIsNotReady) {
  files_.openWithoutHandle(7);
  open();
  store_->SetTabName("missing");
  for (const Failure& row : kFailures) {
    SCOPED_TRACE(row.operation);
    log_.clear();
    EXPECT_FALSE(run(row.operation, row.document));
    expectError(7, "Open DB failed!!");
    expectLog({"DB is not ready!!", row.text});
  }
}

TEST_F(RecordsTest, FailOnARefusedEncryptionBeforeAnUnreadyStore) {
  files_.openWithoutHandle(7);
  open();
  for (const Refusal& row : kRefusals) {
    SCOPED_TRACE(row.operation);
    log_.clear();
    host_.failEncrypt(row.call);
    EXPECT_FALSE(run(row.operation, row.before));
    expectError(kErrCrypt, row.msg);
    expectLog({"Data Encrypt failed"});
  }
}

// --- Adding ---

class AddTest : public RecordsTest {};

TEST_F(AddTest, InsertsOneRow) {
  EXPECT_TRUE(add(R"({"name": "O'Hara", "scope": "a b", "id": null})"));
  EXPECT_TRUE(add(R"({"name": "next", "id": null, "timestamp": "17"})"));
  EXPECT_THAT(query("SELECT * FROM t"), ElementsAre("1|O'Hara|a b|0", "2|next||17"));
  expectNoFailure();
}

TEST_F(AddTest, TakesTheTimeFromTheDatabase) {
  const auto now = [this] { return std::stoll(query("SELECT strftime('%s','now')").front()); };
  const long long before = now();
  EXPECT_TRUE(add(R"({"timestamp": null})"));
  const long long after = now();
  const long long stored = std::stoll(query("SELECT timestamp FROM t").front());
  EXPECT_LE(before, stored);
  EXPECT_GE(after, stored);
  EXPECT_THAT(query("SELECT typeof(timestamp) FROM t"), ElementsAre("integer"));
}

TEST_F(AddTest, RefusesAValueWithANulByte) {
  EXPECT_FALSE(add(R"({"name": "a\u0000'b", "scope": "s"})"));
  expectFailure(1, "unrecognized token: \"'a\"", "Add failed[t]");
  EXPECT_EQ(0, rowCount("t"));
}

// The statement ends inside a literal and fails, so it cannot match other rows.
TEST_F(AddTest, KeepsRowsFromAConditionWithANulByte) {
  execute("INSERT INTO t(name) VALUES('a')");
  EXPECT_FALSE(get(R"({"condition": {"name": "a\u0000"}})"));
  expectFailure(1, "unrecognized token: \"'a\"", "Get failed[t]");
  log_.clear();
  EXPECT_FALSE(del(R"({"condition": {"name": "a\u0000"}})"));
  expectFailure(1, "unrecognized token: \"'a\"", "Delete failed[t]");
  log_.clear();
  EXPECT_FALSE(edit(R"({"modified": {"name": "b\u0000"}})"));
  expectFailure(1, "unrecognized token: \"'b\"", "Edit failed[t]");
  EXPECT_THAT(query("SELECT name FROM t"), ElementsAre("a"));
}

TEST_F(AddTest, StoresAnyOtherText) {
  for (const std::string& name :
       {std::string("'"), std::string("''"), std::string("x'; DROP TABLE t; --"),
        std::string("100%_\\\"\t\n"), std::string("Grüße, 東京"), times(100'000, '\'')}) {
    sent_ = Json::Value();
    sent_["name"] = name;
    EXPECT_TRUE(store_->DBAdd(sent_)) << name;
    EXPECT_EQ(name, names().back());
  }
}

TEST_F(AddTest, FailsOnAConstraint) {
  EXPECT_TRUE(add(R"({"id": 7, "name": "kept"})"));
  EXPECT_FALSE(add(R"({"id": 7, "name": "refused"})"));
  expectFailure(19, "UNIQUE constraint failed: t.id", "Add failed[t]");
  EXPECT_THAT(query("SELECT * FROM t"), ElementsAre("7|kept||0"));
}

TEST_F(AddTest, FailsOnAnEmptyRecord) {
  EXPECT_FALSE(add("{}"));
  expectFailure(1, "near \")\": syntax error", "Add failed[t]");
  EXPECT_THAT(names(), IsEmpty());
}

TEST_F(AddTest, SucceedsWithoutAChange) {
  execute("CREATE TRIGGER skip BEFORE INSERT ON t BEGIN SELECT RAISE(IGNORE); END");
  withDiagnostics(1, [&] { EXPECT_TRUE(add(R"({"name": "x"})")); });
  expectLog({"[t] Add success, changed[0]"});
  EXPECT_THAT(names(), IsEmpty());
}

// --- Deleting ---

class DeleteTest : public RecordsTest {
 protected:
  DeleteTest() { addNames({"a", "b", "b", "%"}); }
};

TEST_F(DeleteTest, RemovesEveryRowThatMatches) {
  EXPECT_TRUE(del(R"({"condition": {"name": "b"}})"));
  EXPECT_THAT(names(), ElementsAre("a", "%"));
  expectNoFailure();
}

TEST_F(DeleteTest, RemovesEveryRowWithoutACondition) {
  EXPECT_TRUE(del("{}"));
  EXPECT_THAT(names(), IsEmpty());
  expectNoFailure();
}

// A condition that is not an object must not count as no condition, which matches every row.
TEST_F(DeleteTest, RemovesNothingForAConditionOfAnotherKind) {
  for (const std::string condition : {R"([])", R"(["b"])", R"("b")", R"("")", "7", "true"}) {
    SCOPED_TRACE(condition);
    log_.clear();
    EXPECT_FALSE(del(R"({"condition": )" + condition + "}"));
    EXPECT_EQ(1, store_->GetErrCode());
    EXPECT_THAT(log_.lines(), ElementsAre(testing::_, "3 oauth_db_basic.cpp Delete failed[t]"));
    EXPECT_THAT(names(), ElementsAre("a", "b", "b", "%"));
  }
}

TEST_F(DeleteTest, TakesAnIntegerForARowId) {
  execute("UPDATE t SET id = 9223372036854775807 WHERE name = 'a'");
  EXPECT_TRUE(del(R"({"condition": {"id": 2}})"));
  EXPECT_TRUE(del(R"({"condition": {"id": 9223372036854775807}})"));
  EXPECT_THAT(names(), ElementsAre("b", "%"));
}

TEST_F(DeleteTest, DoesNotTakeTextForAPattern) {
  EXPECT_TRUE(del(R"({"condition": {"name": "%"}})"));
  EXPECT_THAT(names(), ElementsAre("a", "b", "b"));
}

// SQLite still reports the row count of the earlier delete.
TEST_F(DeleteTest, FailsWithAFailedStatementAfterASuccess) {
  EXPECT_TRUE(del(R"({"condition": {"name": "b"}})"));
  EXPECT_FALSE(del(R"({"condition": {"missing": "b"}})"));
  expectFailure(1, "no such column: missing", "Delete failed[t]");
  EXPECT_THAT(names(), ElementsAre("a", "%"));
}

// --- Reading ---

class GetTest : public RecordsTest {
 protected:
  GetTest() { addNames({"anna", "bob", "hanna"}); }
};

struct Selection {
  const char* request;
  std::vector<std::string> names;
};

TEST_F(GetTest, FollowsTheRequest) {
  const Selection selections[] = {
      {"{}", {"anna", "bob", "hanna"}},
      {R"({"condition": {"id": 2}})", {"bob"}},
      {R"({"condition": {"id": 2, "name": "bob"}})", {"bob"}},
      {R"({"condition": {"id": 1, "name": "bob"}})", {}},
      {R"({"condition": {"name": "%anna%"}})", {}},
      {R"({"condition_like": "name like '%anna%'"})", {"anna", "hanna"}},
      {R"({"condition": {"id": 2}, "condition_like": "name like '%anna%'"})", {"anna", "hanna"}},
      {R"({"condition_like": "name like '_anna'", "option": "LIMIT 1"})", {"hanna"}},
      {R"({"option": "ORDER BY id DESC LIMIT 2"})", {"hanna", "bob"}},
  };
  for (const Selection& row : selections) {
    EXPECT_TRUE(get(row.request)) << row.request;
    std::vector<std::string> read;
    for (const Json::Value& found : rows_) read.push_back(found["name"].asString());
    EXPECT_EQ(row.names, read) << row.request;
  }
}

TEST_F(GetTest, BringsRowsAsStrings) {
  execute("UPDATE t SET timestamp = 1700000000, scope = 'it''s'");
  EXPECT_TRUE(get(R"({"condition": {"id": 2}})"));
  EXPECT_EQ(R"([{"id":"2","name":"bob","scope":"it's","timestamp":"1700000000"}])", text(rows_));
  expectNoFailure();
}

TEST_F(GetTest, SucceedsWithoutARow) {
  rows_ = parse(R"([{"name": "earlier"}])");
  EXPECT_TRUE(get(R"({"condition": {"name": "nobody"}})"));
  EXPECT_EQ("[]", text(rows_));
  expectNoFailure();
}

TEST_F(GetTest, LeavesEarlierRowsOnARefusedEncryption) {
  rows_ = "earlier";
  host_.failEncrypt(1);
  EXPECT_FALSE(get(R"({"condition": {"client_id": "abc"}})"));
  EXPECT_EQ(R"("earlier")", text(rows_));
}

TEST_F(GetTest, LeavesNoEarlierRowsOnAFailedStatement) {
  rows_ = "earlier";
  EXPECT_FALSE(get(R"({"condition_like": ""})"));
  EXPECT_EQ("[]", text(rows_));
  expectFailure(1, "near \";\": syntax error", "Get failed[t]");
}

TEST_F(GetTest, LeavesTheRowsReadBeforeAFailure) {
  // abs() fails in the third row: the smallest integer has no absolute value.
  EXPECT_FALSE(get(R"({"condition_like": "abs(id - 9223372036854775807 - 4) > 0"})"));
  EXPECT_EQ(R"([{"id":"1","name":"anna","scope":"","timestamp":"0"},)"
            R"({"id":"2","name":"bob","scope":"","timestamp":"0"}])",
            text(rows_));
  expectFailure(1, "integer overflow", "Get failed[t]");
}

TEST_F(GetTest, RefusesToReadWithoutADocumentForTheRows) {
  sent_ = parse("{}");
  EXPECT_FALSE(store_->DBGet(sent_, nullptr));
  expectError(kErrBadParameters, "Bad parameters");
  expectLog({"Bad parameters"});
  EXPECT_THAT(log_.formats(), ElementsAre("%s:%d Bad parameters"));
}

TEST_F(GetTest, RefusesToCountWithoutADocumentForTheCount) {
  EXPECT_FALSE(store_->DBGetRowCount(nullptr));
  expectError(kErrBadParameters, "Bad parameters");
  expectLog({"Bad parameters"});
}

// --- Editing ---

class EditTest : public RecordsTest {
 protected:
  EditTest() { addNames({"a", "b", "c"}); }
};

TEST_F(EditTest, WritesIntoWhatMatches) {
  EXPECT_TRUE(edit(R"({"modified": {"name": "O'Hara", "scope": "x"}, "condition": {"id": 2}})"));
  EXPECT_THAT(query("SELECT name, scope FROM t"), ElementsAre("a|", "O'Hara|x", "c|"));
  expectNoFailure();
}

TEST_F(EditTest, WritesIntoEveryRowWithoutACondition) {
  EXPECT_TRUE(edit(R"({"modified": {"name": "x"}})"));
  EXPECT_THAT(names(), ElementsAre("x", "x", "x"));
}

TEST_F(EditTest, TakesEqualValuesForAChange) {
  EXPECT_TRUE(edit(R"({"modified": {"name": "b"}, "condition": {"id": 2}})"));
  expectNoFailure();
}

TEST_F(EditTest, FailsWithNothingToWrite) {
  EXPECT_FALSE(edit(R"({"modified": {}, "condition": {"id": 2}})"));
  expectFailure(1, "near \"WHERE\": syntax error", "Edit failed[t]");
}

// SQLite still reports the row count of the earlier edit.
TEST_F(EditTest, FailsWithAFailedStatementAfterASuccess) {
  EXPECT_TRUE(edit(R"({"modified": {"name": "x"}, "condition": {"id": 2}})"));
  EXPECT_FALSE(edit(R"({"modified": {"id": "1"}, "condition": {"id": 2}})"));
  expectFailure(19, "UNIQUE constraint failed: t.id", "Edit failed[t]");
  EXPECT_THAT(query("SELECT id, name FROM t"), ElementsAre("1|a", "2|x", "3|c"));
}

// --- Quotes through a store, which doubles them as well ---

class StoreQuotesTest : public StoreTest {
 protected:
  const std::string token_ = "it's" + times(60, 't');
  Json::Value result_;
  OAUTHDBToken tokens_{"oauth_token"};

  void SetUp() override {
    ASSERT_TRUE(tokens_.Add("O'Brien", times(64, 'c'), "read", times(64, 'r'), token_, "1700000600",
                            "code", "state", "", result_));
  }
};

TEST_F(StoreQuotesTest, AreStoredDoubled) {
  EXPECT_THAT(query("SELECT username, access_token FROM oauth_token"),
              ElementsAre("O''Brien|it''s" + times(60, 't')));
}

TEST_F(StoreQuotesTest, AreFoundAgain) {
  Json::Value rows;
  EXPECT_TRUE(tokens_.GetWithAccessToken(token_, &rows));
  ASSERT_EQ(1U, rows.size());
  EXPECT_EQ("O''Brien", rows[0U]["username"].asString());
}

// --- Diagnostics ---

TEST_F(RecordsTest, NameTheTableInTheReportOfAnAdd) {
  for (const std::string table : kTables) {
    simplify(table);
    withDiagnostics(1, [&] { EXPECT_TRUE(add(R"({"id": 1})")); });
    expectLog({"[" + table + "] Add success, changed[1]"});
    EXPECT_THAT(log_.formats(), ElementsAre("%s:%d [%s] Add success, changed[%d]"));
  }
}

TEST_F(RecordsTest, CallEveryTableClientInfoInOtherReports) {
  for (const std::string table : kTables) {
    SCOPED_TRACE(table);
    simplify(table);
    execute("INSERT INTO " + table + " VALUES(1), (2)");
    withDiagnostics(1, [&] {
      EXPECT_TRUE(get("{}"));
      EXPECT_TRUE(edit(R"({"modified": {"id": "3"}, "condition": {"id": 1}})"));
      EXPECT_TRUE(del("{}"));
    });
    expectLog({"ClientInfo Get Done", "ClientInfo Edit success, changed[1]",
               "ClientInfo Delete success, changed[2]"});
    EXPECT_THAT(log_.formats(), ElementsAre("%s:%d ClientInfo Get Done",
                                            "%s:%d ClientInfo Edit success, changed[%d]",
                                            "%s:%d ClientInfo Delete success, changed[%d]"));
  }
}

TEST_F(RecordsTest, TraceEveryStepOfAnAdd) {
  withDiagnostics(15, [&] { EXPECT_TRUE(add(R"({"name": "x", "id": null})")); });
  expectLog({"==> DBAdd", "==> GetInsertParam", "==> DBCmd",
             "==> DBCmdRun[INSERT INTO t (id, name) VALUES(NULL, 'x');]",
             "[t] Add success, changed[1]"});
}

TEST_F(RecordsTest, TraceEveryStepOfADelete) {
  addNames({"x"});
  withDiagnostics(15, [&] { EXPECT_TRUE(del(R"({"condition": {"id": 1}})")); });
  expectLog({"==> DBDel", "==> GetConditionParam", "==> ConcateParam", "==> DBCmd",
             "==> DBCmdRun[DELETE FROM t WHERE id='1';]", "ClientInfo Delete success, changed[1]"});
}

TEST_F(RecordsTest, TraceEveryStepOfARead) {
  addNames({"x"});
  withDiagnostics(15, [&] { EXPECT_TRUE(get(R"({"condition": {"id": 1}})")); });
  expectLog({"==> DBGet", "==> GetConditionParam", "==> ConcateParam", "==> DBCmd",
             "==> DBCmdRun[SELECT * FROM t WHERE id='1' ;]", "==> TabGetCallback",
             "##### [0][id = 1]", "##### [1][name = x]", "##### [2][scope = ]",
             "##### [3][timestamp = 0]", "ClientInfo Get Done"});
}

TEST_F(RecordsTest, TranslateNoConditionBesideAPattern) {
  withDiagnostics(15,
                  [&] { EXPECT_TRUE(get(R"({"condition": {"id": 1}, "condition_like": "0"})")); });
  expectLog(
      {"==> DBGet", "==> DBCmd", "==> DBCmdRun[SELECT * FROM t WHERE 0 ;]", "ClientInfo Get Done"});
}

TEST_F(RecordsTest, TraceEveryStepOfAnEdit) {
  addNames({"x"});
  withDiagnostics(
      15, [&] { EXPECT_TRUE(edit(R"({"modified": {"name": "y"}, "condition": {"id": 1}})")); });
  expectLog({"==> DBEdit", "==> GetUpdateParam", "==> ConcateParam", "==> GetConditionParam",
             "==> ConcateParam", "==> DBCmd", "==> DBCmdRun[UPDATE t SET name='y' WHERE id='1';]",
             "ClientInfo Edit success, changed[1]"});
}

TEST_F(RecordsTest, AreSilentWithoutReportsOrTraces) {
  withDiagnostics(4, [&] {
    EXPECT_TRUE(add(R"({"name": "x"})"));
    EXPECT_TRUE(get("{}"));
    EXPECT_TRUE(edit(R"({"modified": {"name": "y"}})"));
    EXPECT_TRUE(del("{}"));
  });
  EXPECT_THAT(log_.lines(), IsEmpty());
}

}  // namespace
