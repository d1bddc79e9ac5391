
#include <stdexcept>
#include <string_view>

#include "json_text.h"
#include "oauth_db_basic.h"
#include "store_test.h"

using testing::ElementsAre;
using testing::IsEmpty;
using namespace std::string_view_literals;
using ZEVOOAUTHSERVER::OAUTHDBBasic;

namespace {

Json::Value member(const std::string& name, const Json::Value& value) {
  Json::Value document;
  document[name] = value;
  return document;
}

struct Row {
  const char* json;
  std::string_view sql;
};

// Translates the document of each row and compares with the row's text.
template <class Rows, class Translate>
void expectEach(const Rows& rows, Translate translate) {
  for (const Row& row : rows) EXPECT_EQ(row.sql, translate(parse(row.json))) << row.json;
}

// A value is written the same way in every fragment, except null.
constexpr Row kValues[] = {
    {R"("abc")", "'abc'"},
    {R"("")", "''"},
    {R"(" a  b ")", "' a  b '"},
    {R"("5")", "'5'"},
    {R"("NULL")", "'NULL'"},
    // Single quotes are doubled, and nothing else is changed.
    {R"("O'Hara")", "'O''Hara'"},
    {R"("'")", "''''"},
    {R"("''")", "''''''"},
    {R"("'a'b'")", "'''a''b'''"},
    {R"("O''Brien")", "'O''''Brien'"},
    {R"("x'; DROP TABLE oauth_log; --")", "'x''; DROP TABLE oauth_log; --'"},
    {R"("\\ % _ \" ` ; -- /* ? $1")", R"('\ % _ " ` ; -- /* ? $1')"},
    {R"("\t\n\r\u0001\u007f")", "'\t\n\r\x01\x7f'"},
    {R"("Grüße, 東京 🔑")", "'Grüße, 東京 🔑'"},
    // Integers become decimal text.
    {"5", "'5'"},
    {"0", "'0'"},
    {"-1", "'-1'"},
    {"2147483647", "'2147483647'"},
    {"2147483648", "'2147483648'"},
    {"-2147483649", "'-2147483649'"},
    {"9223372036854775807", "'9223372036854775807'"},
    {"-9223372036854775808", "'-9223372036854775808'"},
    {"18446744073709551615", "'18446744073709551615'"},
    // A NUL byte stays, and the quotes behind it are doubled too.
    {R"("a\u0000b")", "'a\0b'"sv},
    {R"("\u0000' OR 1")", "'\0'' OR 1'"sv},
    {R"("it's\u0000'")", "'it''s\0'''"sv},
};

// Values that cannot be converted to text.
constexpr const char* kRefused[] = {R"({"a": {}})", R"({"a": []})", R"({"a": {"b": "1"}})",
                                    R"({"a": ["1"]})", R"({"a": "1", "b": {}})"};

// 200000 bytes, every second one a single quote; and the same text in a fragment.
std::string manyQuotes() {
  std::string text;
  for (int i = 0; i < 100'000; ++i) text += "a'";
  return text;
}
std::string manyQuotesQuoted() {
  std::string text = "'";
  for (int i = 0; i < 100'000; ++i) text += "a''";
  return text + "'";
}

class TranslationTest : public StoreTest {
 protected:
  // The lines that the translation logs with every class of diagnostics on.
  template <class Body>
  std::vector<std::string> traceOf(Body body) const {
    withDiagnostics(15, body);
    return log_.lines();
  }

  OAUTHDBBasic store_;
};

// --- Name and value pairs ---

class PairsTest : public TranslationTest {
 protected:
  std::string concatenated(const Json::Value& values) { return store_.ConcateParam(values, ", "); }
};

constexpr Row kPairs[] = {
    {"{}", ""},
    {"null", ""},
    {R"({"a": "1"})", "a='1'"},
    {R"({"b": "2", "a": "1"})", "a='1', b='2'"},
    {R"({"c": "3", "a": "1", "b": "2"})", "a='1', b='2', c='3'"},
    {R"({"a": "", "b": ""})", "a='', b=''"},
    {R"({"a": null})", "a=''"},
    {R"({"a": null, "b": "2"})", "a='', b='2'"},
    {R"({"timestamp": null})", "timestamp=''"},
    {R"({"id": 5, "name": "O'Hara"})", "id='5', name='O''Hara'"},
    {R"({"a": "x, y", "b": "z"})", "a='x, y', b='z'"},
    // Names are in the order of their bytes: capitals, the underscore, small letters, other
    // characters. A shorter name comes before a longer one that begins with it.
    {R"({"ü": "6", "aa": "5", "a": "4", "_": "3", "Z": "2", "B": "1"})",
     "B='1', Z='2', _='3', a='4', aa='5', ü='6'"},
    {R"({"client_id": "x", "client": "y"})", "client='y', client_id='x'"},
    // Names are not quoted or escaped: they never come from a user.
    {R"({"it's": "1"})", "it's='1'"},
    {R"({"a b": "1", "c\\d": "2"})", "a b='1', c\\d='2'"},
};

TEST_F(PairsTest, ComeInByteOrderOfTheirNames) {
  expectEach(kPairs, [this](const Json::Value& v) { return concatenated(v); });
}

TEST_F(PairsTest, QuoteTheirValues) {
  for (const Row& value : kValues)
    EXPECT_EQ(std::string("a=").append(value.sql), concatenated(member("a", parse(value.json))))
        << value.json;
}

TEST_F(PairsTest, TakeTheSeparatorAsItIs) {
  const Json::Value values = parse(R"({"b": "2", "a": "1", "c": "3"})");
  EXPECT_EQ("a='1' and b='2' and c='3'", store_.ConcateParam(values, " and "));
  EXPECT_EQ("a='1'b='2'c='3'", store_.ConcateParam(values, ""));
  EXPECT_EQ("a='1''b='2''c='3'", store_.ConcateParam(values, "'"));
}

TEST_F(PairsTest, HaveNoLimitOfLength) {
  EXPECT_EQ("a=" + manyQuotesQuoted(), concatenated(member("a", manyQuotes())));
}

TEST_F(PairsTest, PassOnTheRefusalOfAValue) {
  for (const char* const json : kRefused)
    EXPECT_THROW(concatenated(parse(json)), Json::Exception) << json;
}

TEST_F(PairsTest, AreTraced) {
  EXPECT_THAT(traceOf([this] { concatenated(parse(R"({"a": "1"})")); }),
              ElementsAre("3 oauth_db_basic.cpp ==> ConcateParam"));
  EXPECT_THAT(log_.formats(), ElementsAre("%s:%d ==> %s"));
}

// --- The condition ---

class ConditionTest : public TranslationTest {};

constexpr Row kConditions[] = {
    {"{}", ""},
    {"null", ""},
    {R"({"id": 5})", " WHERE id='5'"},
    {R"({"client_id": "abc", "code": "x1"})", " WHERE client_id='abc' and code='x1'"},
    {R"({"c": "3", "b": "2", "a": "1"})", " WHERE a='1' and b='2' and c='3'"},
    {R"({"a": null})", " WHERE a=''"},
    {R"({"timestamp": null})", " WHERE timestamp=''"},
    {R"({"scope": "read and write"})", " WHERE scope='read and write'"},
    {R"({"it's": "1"})", " WHERE it's='1'"},
};

TEST_F(ConditionTest, JoinsItsPairsOrIsNothing) {
  expectEach(kConditions, [this](const Json::Value& v) { return store_.GetConditionParam(v); });
}

TEST_F(ConditionTest, QuotesItsValues) {
  for (const Row& value : kValues)
    EXPECT_EQ(std::string(" WHERE a=").append(value.sql),
              store_.GetConditionParam(member("a", parse(value.json))))
        << value.json;
}

TEST_F(ConditionTest, PassesOnTheRefusalOfAValue) {
  for (const char* const json : kRefused)
    EXPECT_THROW(store_.GetConditionParam(parse(json)), Json::Exception) << json;
}

TEST_F(ConditionTest, IsTraced) {
  EXPECT_THAT(traceOf([this] { store_.GetConditionParam(parse(R"({"a": "1"})")); }),
              ElementsAre("3 oauth_db_basic.cpp ==> GetConditionParam",
                          "3 oauth_db_basic.cpp ==> ConcateParam"));
  EXPECT_THAT(log_.formats(), ElementsAre("%s:%d ==> %s", "%s:%d ==> %s"));
}

TEST_F(ConditionTest, MakesNoPairsOfNothing) {
  EXPECT_THAT(traceOf([this] { store_.GetConditionParam(parse("{}")); }),
              ElementsAre("3 oauth_db_basic.cpp ==> GetConditionParam"));
}

// --- What an update sets ---

class UpdateTest : public TranslationTest {};

constexpr Row kUpdates[] = {
    {R"({"modified": {"enable": "0", "scope": "a b"}, "condition": {"client_id": "abc"}})",
     " SET enable='0', scope='a b' WHERE client_id='abc'"},
    {R"({"modified": {"c": "3", "b": "2", "a": "1"}, "condition": {"e": "5", "d": "4"}})",
     " SET a='1', b='2', c='3' WHERE d='4' and e='5'"},
    {R"({"modified": {"a": "1"}})", " SET a='1'"},
    {R"({"modified": {"a": "1"}, "condition": {}})", " SET a='1'"},
    {R"({"modified": {"a": "1"}, "condition": null})", " SET a='1'"},
    // With nothing to set, the database refuses the statement.
    {R"({"modified": {}, "condition": {"id": 5}})", " SET  WHERE id='5'"},
    {R"({"modified": null, "condition": {"id": 5}})", " SET  WHERE id='5'"},
    {R"({"condition": {"id": 5}})", " SET  WHERE id='5'"},
    {"{}", " SET "},
    {"null", " SET "},
    {R"({"modified": {"a": null, "timestamp": null}})", " SET a='', timestamp=''"},
    {R"({"modified": {"name": "it's"}, "condition": {"name": "O'Hara"}})",
     " SET name='it''s' WHERE name='O''Hara'"},
    // An edit ignores the keys that only a read uses.
    {R"({"modified": {"a": "1"}, "condition_like": "b like '%c%'", "option": "LIMIT 1"})",
     " SET a='1'"},
};

TEST_F(UpdateTest, SetsWhatIsModifiedUnderTheCondition) {
  expectEach(kUpdates, [this](const Json::Value& v) { return store_.GetUpdateParam(v); });
}

TEST_F(UpdateTest, QuotesItsValues) {
  for (const Row& value : kValues) {
    Json::Value request;
    request["modified"]["a"] = parse(value.json);
    request["condition"]["b"] = parse(value.json);
    EXPECT_EQ(std::string(" SET a=").append(value.sql).append(" WHERE b=").append(value.sql),
              store_.GetUpdateParam(request))
        << value.json;
  }
}

TEST_F(UpdateTest, PassesOnTheRefusalOfAValue) {
  for (const char* const key : {"modified", "condition"})
    for (const char* const json : kRefused)
      EXPECT_THROW(store_.GetUpdateParam(member(key, parse(json))), Json::Exception)
          << key << " " << json;
}

TEST_F(UpdateTest, IsTraced) {
  EXPECT_THAT(
      traceOf([this] {
        store_.GetUpdateParam(parse(R"({"modified": {"a": "1"}, "condition": {"b": "2"}})"));
      }),
      ElementsAre(
          "3 oauth_db_basic.cpp ==> GetUpdateParam", "3 oauth_db_basic.cpp ==> ConcateParam",
          "3 oauth_db_basic.cpp ==> GetConditionParam", "3 oauth_db_basic.cpp ==> ConcateParam"));
}

// --- What an insert writes ---

class InsertTest : public TranslationTest {};

constexpr Row kInserts[] = {
    {R"({"name": "O'Hara", "id": null, "timestamp": null})",
     " (id, name, timestamp) VALUES(NULL, 'O''Hara', strftime('%s','now'))"},
    {R"({"a": "1"})", " (a) VALUES('1')"},
    {R"({"b": "2", "a": "1"})", " (a, b) VALUES('1', '2')"},
    {R"({"a": "", "b": ""})", " (a, b) VALUES('', '')"},
    {R"({"a": null, "b": null})", " (a, b) VALUES(NULL, NULL)"},
    {R"({"id": 5, "name": "x"})", " (id, name) VALUES('5', 'x')"},
    {R"({"ü": "5", "aa": "4", "a": "3", "_": "2", "B": "1"})",
     " (B, _, a, aa, ü) VALUES('1', '2', '3', '4', '5')"},
    {R"({"it's": "1"})", " (it's) VALUES('1')"},
    {R"({"a": "x, y) VALUES("})", " (a) VALUES('x, y) VALUES(')"},
    // For an empty record, the database refuses the statement.
    {"{}", " () VALUES()"},
    {"null", " () VALUES()"},
    // Only a null timestamp is replaced by the database's clock.
    {R"({"timestamp": null})", " (timestamp) VALUES(strftime('%s','now'))"},
    {R"({"timestamp": "1700000000"})", " (timestamp) VALUES('1700000000')"},
    {R"({"timestamp": 1700000000})", " (timestamp) VALUES('1700000000')"},
    {R"({"timestamp": ""})", " (timestamp) VALUES('')"},
    {R"json({"timestamp": "strftime('%s','now')"})json",
     " (timestamp) VALUES('strftime(''%s'',''now'')')"},
    {R"({"Timestamp": null, "expired_time": null, "time": null, "timestamps": null})",
     " (Timestamp, expired_time, time, timestamps) VALUES(NULL, NULL, NULL, NULL)"},
    // In a record, the keys of a request are ordinary columns.
    {R"({"condition": "a", "modified": null})", " (condition, modified) VALUES('a', NULL)"},
};

TEST_F(InsertTest, ListsColumnsBesideTheirValues) {
  expectEach(kInserts, [this](const Json::Value& v) { return store_.GetInsertParam(v); });
}

TEST_F(InsertTest, QuotesItsValues) {
  for (const Row& value : kValues)
    EXPECT_EQ(std::string(" (a) VALUES(").append(value.sql) + ")",
              store_.GetInsertParam(member("a", parse(value.json))))
        << value.json;
}

TEST_F(InsertTest, HasNoLimitOfLength) {
  EXPECT_EQ(" (a) VALUES(" + manyQuotesQuoted() + ")",
            store_.GetInsertParam(member("a", manyQuotes())));
}

TEST_F(InsertTest, PassesOnTheRefusalOfAValue) {
  for (const char* const json : kRefused)
    EXPECT_THROW(store_.GetInsertParam(parse(json)), Json::Exception) << json;
}

TEST_F(InsertTest, IsTraced) {
  EXPECT_THAT(traceOf([this] { store_.GetInsertParam(parse(R"({"a": "1", "b": null})")); }),
              ElementsAre("3 oauth_db_basic.cpp ==> GetInsertParam"));
  EXPECT_THAT(log_.formats(), ElementsAre("%s:%d ==> %s"));
}

// --- All four ---

void translateEverything(OAUTHDBBasic& store) {
  const Json::Value request = parse(R"({"modified": {"a": "1"}, "condition": {"b": "2"}})");
  store.GetInsertParam(request["modified"]);
  store.ConcateParam(request["modified"], ", ");
  store.GetConditionParam(request["condition"]);
  store.GetUpdateParam(request);
}

TEST_F(TranslationTest, IsSilentWithoutEntryTraces) {
  withDiagnostics(7, [this] { translateEverything(store_); });
  EXPECT_THAT(log_.lines(), IsEmpty());
}

TEST_F(TranslationTest, NeedsNoDatabase) {
  files_.openWithoutHandle(7);
  OAUTHDBBasic store;
  log_.clear();
  translateEverything(store);
  expectError(store, 7, "Open DB failed!!");
  EXPECT_THAT(log_.lines(), IsEmpty());
}

}  // namespace
