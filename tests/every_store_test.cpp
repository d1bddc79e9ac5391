// Rules that several stores share. What differs between them is in their descriptions.

#include "every_store.h"

#include <algorithm>
#include <cerrno>
#include <ctime>
#include <limits>
#include <set>
#include <utility>

using testing::ElementsAre;
using testing::ElementsAreArray;
using testing::IsEmpty;
using testing::MatchesRegex;
using testing::StartsWith;
using testing::Values;
using ZEVOOAUTHSERVER::kErrBadParameters;
using ZEVOOAUTHSERVER::kErrCreateTable;
using ZEVOOAUTHSERVER::kErrCrypt;
using ZEVOOAUTHSERVER::kErrNone;
using ZEVOOAUTHSERVER::kErrTableFull;

namespace {

const StoreDescription& described(const std::string& table) {
  for (const StoreDescription* const store : {&kClients, &kCodes, &kTokens})
    if (store->table == table) return *store;
  return kAuditLog;
}

// The parameter is the name of the table.
class DescribedStoreTest : public RowStoreTest, public testing::WithParamInterface<std::string> {
 protected:
  DescribedStoreTest() : RowStoreTest(described(GetParam())) {}

  std::vector<Change> adds() const { return chosen(false); }
  std::vector<Change> edits() const { return chosen(true); }

  // A table in which the change succeeds: row 1 for an edit, nothing for an addition.
  void prepareFor(const Change& change) const {
    emptyTable();
    if (change.edits) insert("1", its_.row);
  }
  static int run(const Change& change, Store& store, const Row& row) {
    Json::Value result;
    return change.run(store, 1, row, result);
  }
  static std::string verb(const Change& change) { return change.edits ? "Edit" : "Add"; }

  // What a change that was refused for its arguments leaves.
  void expectBadParameters(const Store& store) const {
    if (its_.reportsBadLengths)
      expectError(store, kErrBadParameters, "Bad parameters");
    else
      expectEarlierError(store);
    EXPECT_THAT(log_.lines(), ElementsAre(own("Bad parameters")));
    EXPECT_THAT(log_.formats(), ElementsAre("%s:%d Bad parameters"));
  }
  void expectFull(const Store& store) const {
    expectError(store, kErrTableFull, its_.full);
    EXPECT_THAT(log_.lines(), ElementsAre(own(its_.full)));
    EXPECT_THAT(log_.formats(), ElementsAre("%s:%d " + its_.full));
  }

  // Row n, with a key of its own.
  Row numbered(char n) const { return with(its_.row, its_.key, times(64, n)); }
  void setCeiling(int rows) const {
    writeSettings("{\"" + its_.ceiling + "\": " + std::to_string(rows) + "}");
  }

 private:
  std::vector<Change> chosen(bool edits) const {
    std::vector<Change> result;
    for (const Change& change : its_.changes)
      if (change.edits == edits) result.push_back(change);
    return result;
  }
};

std::string tableName(const testing::TestParamInfo<std::string>& info) { return info.param; }
const auto kEveryStore = Values("oauth_clientInfo", "oauth_grantCode", "oauth_token", "oauth_log");
const auto kKeyedStores = Values("oauth_clientInfo", "oauth_grantCode", "oauth_token");
const auto kExpiringStores = Values("oauth_grantCode", "oauth_token");

// --- Add and Edit ---

class StoreChangeTest : public DescribedStoreTest {};
INSTANTIATE_TEST_SUITE_P(, StoreChangeTest, kKeyedStores, tableName);

TEST_P(StoreChangeTest, KeepsAnEarlierErrorOnSuccess) {
  for (const Change& change : its_.changes) {
    SCOPED_TRACE(change.label);
    const auto store = its_.open();
    prepareFor(change);
    recordEarlierError(*store);
    EXPECT_EQ(1, run(change, *store, its_.row));
    expectEarlierError(*store);
    EXPECT_THAT(log_.lines(), IsEmpty());
  }
}

TEST_P(StoreChangeTest, AcceptsExactlyTheLengthsOfItsRules) {
  const auto store = its_.open();
  for (const Change& change : its_.changes)
    for (const Field& field : change.fields)
      for (const int length : {field.min - 1, field.min, field.max, field.max + 1}) {
        if (field.max == 0) continue;
        SCOPED_TRACE(change.label + " with " + field.column + " of " + std::to_string(length) +
                     " bytes");
        prepareFor(change);
        const Lines before = rows();
        recordEarlierError(*store);
        log_.clear();
        Json::Value result;
        const Row row = with(its_.row, field.column, times(length, '1'));
        const int done = change.run(*store, 1, row, result);
        if (length < field.min || length > field.max) {
          EXPECT_EQ(0, done);
          expectBadParameters(*store);
          EXPECT_EQ(Json::Value(), result);
          EXPECT_EQ(before, rows());
        } else {
          EXPECT_EQ(1, done);
          expectEarlierError(*store);
          EXPECT_THAT(log_.lines(), IsEmpty());
        }
      }
}

// Make each value too long in turn. The trace shows which values were checked.
TEST_P(StoreChangeTest, StopsAtTheFirstBadLength) {
  for (const Change& change : its_.changes) {
    if (!change.edits && &change != &its_.changes.front()) continue;  // checks random texts too
    Lines checked;
    for (const Field& field : change.fields) {
      if (field.max == 0) continue;
      const Row bad = with(its_.row, field.column, times(field.max + 1, '1'));
      Lines expected = checked;
      expected.push_back("3 oauth_utils.cpp checkStrLen[" + bad.at(field.column) + "]");
      expected.push_back(own("Bad parameters"));
      EXPECT_THAT(traced(4, [&](Store& store) { run(change, store, bad); }),
                  ElementsAreArray(expected))
          << change.label << " with " << field.column;
      checked.push_back("3 oauth_utils.cpp checkStrLen[" + its_.row.at(field.column) + "]");
    }
  }
}

TEST_P(StoreChangeTest, MeasuresLengthsInBytes) {
  const auto store = its_.open();
  for (const Change& change : its_.changes)
    for (const Field& field : change.fields) {
      if (field.max == 0) continue;
      SCOPED_TRACE(change.label + " with " + field.column);
      std::string longest;
      for (int i = 0; i < field.max / 2; ++i) longest += "\u00e9";
      prepareFor(change);
      EXPECT_EQ(1, run(change, *store, with(its_.row, field.column, longest)));
      EXPECT_EQ(sealedIf(field.column, longest), stored(field.column));
      prepareFor(change);
      const Lines before = rows();
      EXPECT_EQ(0, run(change, *store, with(its_.row, field.column, longest + "\u00e9")));
      EXPECT_EQ(before, rows());
    }
}

TEST_P(StoreChangeTest, StoresNothingThatCannotBeEncrypted) {
  for (const Change& change : its_.changes) {
    Lines written = its_.columns;
    if (change.edits) written.clear();
    if (change.edits)
      for (const Field& field : change.fields) written.push_back(field.column);
    const auto encryptions = std::count_if(written.begin(), written.end(), isSensitive);
    for (int call = 1; call <= encryptions; ++call) {
      SCOPED_TRACE(change.label + " at encryption " + std::to_string(call));
      const auto store = its_.open();
      prepareFor(change);
      const Lines before = everyRow();
      log_.clear();
      host_.failEncrypt(call);
      Json::Value result;
      EXPECT_EQ(0, change.run(*store, 1, its_.other, result));
      EXPECT_THAT(result.getMemberNames(), ElementsAreArray(change.edits ? Lines() : its_.secrets));
      if (&change == &its_.changes.front()) {
        EXPECT_EQ(secretsOf(its_.other), result);
      }
      expectError(*store, kErrCrypt, "Data Encrypt failed");
      EXPECT_THAT(log_.lines(), ElementsAre(base("Data Encrypt failed")));
      EXPECT_EQ(before, everyRow());
    }
  }
}

TEST_P(StoreChangeTest, ReportsAFailedStatement) {
  createDatabase();
  insertRow("1");
  files_.openReadOnly();
  for (const Change& change : its_.changes) {
    SCOPED_TRACE(change.label);
    const auto store = its_.open();
    log_.clear();
    Json::Value result;
    EXPECT_EQ(0, change.run(*store, 1, its_.row, result));
    // Add() returns its secrets all the same.
    EXPECT_THAT(result.getMemberNames(), ElementsAreArray(change.edits ? Lines() : its_.secrets));
    expectError(*store, 8, "attempt to write a readonly database");
    EXPECT_THAT(log_.lines(),
                ElementsAreArray(failed(verb(change), "attempt to write a readonly database", 8)));
  }
}

TEST_P(StoreChangeTest, RewritesWhatItTakesAlone) {
  const auto store = its_.open();
  for (const Change& change : edits()) {
    SCOPED_TRACE(change.label);
    prepareFor(change);
    const Row second = insertRow("4294967297");
    Row expected = second;
    for (const Field& field : change.fields) expected[field.column] = its_.other.at(field.column);
    for (const auto& [column, value] : change.sets) expected[column] = value;
    Json::Value result;
    EXPECT_EQ(1, change.run(*store, 4294967297LL, its_.other, result));
    EXPECT_THAT(rows(), ElementsAre(printed(its_.row), printed(expected, "4294967297")));
    // An edit that changes nothing succeeds too.
    EXPECT_EQ(1, change.run(*store, 4294967297LL, its_.other, result));
    EXPECT_THAT(rows(), ElementsAre(printed(its_.row), printed(expected, "4294967297")));
    EXPECT_THAT(log_.lines(), IsEmpty());
  }
}

TEST_P(StoreChangeTest, FailsWithoutSuchARow) {
  const auto store = its_.open();
  for (const Change& change : edits())
    for (const long long id : {0LL, -1LL, 2LL, 4294967297LL}) {
      SCOPED_TRACE(change.label + " of " + std::to_string(id));
      prepareFor(change);
      recordEarlierError(*store);
      log_.clear();
      Json::Value result;
      EXPECT_EQ(0, change.run(*store, id, its_.other, result));
      expectEarlierError(*store);
      EXPECT_THAT(log_.lines(), ElementsAreArray(failed("Edit")));
      EXPECT_THAT(rows(), ElementsAre(printed(its_.row)));
    }
}

TEST_P(StoreChangeTest, TracesEveryStepOfAnEdit) {
  createDatabase();
  insert("1", its_.row);
  for (const Change& change : edits()) {
    SCOPED_TRACE(change.label);
    Lines expected;
    Row written = change.sets;
    if (!change.trace.empty()) expected.push_back(own("==> " + change.trace));
    for (const Field& field : change.fields) {
      const std::string& value = its_.row.at(field.column);
      expected.push_back("3 oauth_utils.cpp checkStrLen[" + value + "]");
      written[field.column] = sealedIf(field.column, value);
    }
    expected.push_back(base("==> DBEdit"));
    if (written.count("client_id") != 0) expected.push_back(base("==> ParamEncrypt[client_id]"));
    std::string list;
    for (const auto& [column, value] : written)
      list.append(list.empty() ? "" : ", ").append(column).append("='" + value + "'");
    for (const std::string step : {"==> GetUpdateParam", "==> ConcateParam",
                                   "==> GetConditionParam", "==> ConcateParam", "==> DBCmd"})
      expected.push_back(base(step));
    expected.push_back(
        base("==> DBCmdRun[UPDATE " + its_.table + " SET " + list + " WHERE id='1';]"));
    expected.push_back(base("ClientInfo Edit success, changed[1]"));
    EXPECT_THAT(traced(15, [&](Store& store) { EXPECT_EQ(1, run(change, store, its_.row)); }),
                ElementsAreArray(expected));
  }
}

// --- Quotes and NUL bytes ---

class StoreTextTest : public DescribedStoreTest {
 protected:
  // Each value that a change takes: what is given, and what is then stored.
  void expectStored(
      const std::function<std::string(const Change&, const Field&)>& given,
      const std::function<std::string(const Field&, const std::string& given)>& expected) const {
    const auto store = its_.open();
    for (const Change& change : its_.changes)
      for (const Field& field : change.fields) {
        const std::string value = given(change, field);
        if (field.max != 0 && value.size() > static_cast<std::size_t>(field.max)) continue;
        if (field.min == 64 && value.size() != 64) continue;
        SCOPED_TRACE(change.label + " with " + field.column + " given as " + value);
        prepareFor(change);
        EXPECT_EQ(1, run(change, *store, with(its_.row, field.column, value)));
        EXPECT_EQ(sealedIf(field.column, expected(field, value)), stored(field.column));
      }
  }
  static std::string kept(const Field& field, const std::string& value) {
    return field.asGiven ? value : doubled(value);
  }
  // The zone of an address may be any text.
  static constexpr char kZone[] = "fe80::1%";
};
INSTANTIATE_TEST_SUITE_P(, StoreTextTest, kEveryStore, tableName);

TEST_P(StoreTextTest, StoresASingleQuoteDoubledUnlessTakenAsGiven) {
  expectStored(
      [&](const Change&, const Field& field) {
        if (field.column == "ip") return kZone + std::string("a'b");
        std::string value = its_.row.at(field.column);
        value.front() = value.back() = '\'';
        return value;
      },
      kept);
}

TEST_P(StoreTextTest, KeepsStatementsInsideAValueAsText) {
  expectStored(
      [&](const Change& change, const Field& field) {
        return (field.column == "ip" ? kZone : "") +
               std::string(change.edits ? "x' WHERE 1; DROP TABLE " : "x'); DROP TABLE ") +
               its_.table + "; --";
      },
      kept);
  EXPECT_EQ(1, rowCount());
}

TEST_P(StoreTextTest, EndsEveryQuotedValueAtItsFirstNul) {
  for (const std::size_t cut : {0U, 1U})
    expectStored(
        [&](const Change&, const Field& field) {
          std::string value = its_.row.at(field.column);
          if (field.asGiven) return value;
          if (field.column == "ip") return value + std::string("\0'", 2);
          value[cut] = '\0';
          value[cut + 1] = '\'';
          return value;
        },
        [](const Field&, const std::string& given) { return given.substr(0, given.find('\0')); });
}

class StoreTextAsGivenTest : public DescribedStoreTest {};
INSTANTIATE_TEST_SUITE_P(, StoreTextAsGivenTest, kExpiringStores, tableName);

// SQLite reads the statement up to the NUL byte, and finds a text without a closing quote.
TEST_P(StoreTextAsGivenTest, RefusesANul) {
  const auto store = its_.open();
  for (const Change& change : its_.changes)
    for (const Field& field : change.fields) {
      if (!field.asGiven) continue;
      SCOPED_TRACE(change.label + " with " + field.column);
      std::string value = its_.row.at(field.column);
      if (field.column == "ip")
        value += std::string("\0'", 2);
      else
        value[1] = '\0';
      prepareFor(change);
      const Lines before = rows();
      log_.clear();
      EXPECT_EQ(0, run(change, *store, with(its_.row, field.column, value)));
      if (field.column == "client_id") {
        expectError(*store, kErrCrypt, "Data Encrypt failed");
        EXPECT_THAT(log_.lines(), ElementsAre(base("Data Encrypt failed")));
      } else {
        EXPECT_EQ(1, store->GetErrCode());
        EXPECT_THAT(log_.lines(),
                    ElementsAre(StartsWith(base("Run Command failed!![unrecognized token: \"'")),
                                failed(verb(change)).front()));
      }
      EXPECT_EQ(before, rows());
    }
}

// --- Add ---

class StoreAddTest : public DescribedStoreTest {
 protected:
  const Change add_ = its_.changes.front();
  std::shared_ptr<Store> store_ = its_.open();
};
INSTANTIATE_TEST_SUITE_P(, StoreAddTest, kKeyedStores, tableName);

TEST_P(StoreAddTest, StoresEveryColumn) {
  EXPECT_EQ(1, run(add_, *store_, its_.row));
  EXPECT_THAT(rows(), ElementsAre(printed(its_.row)));
  EXPECT_THAT(log_.lines(), IsEmpty());
}

TEST_P(StoreAddTest, ReturnsItsSecretsAlone) {
  Json::Value result;
  EXPECT_EQ(1, add_.run(*store_, 0, its_.row, result));
  EXPECT_EQ(secretsOf(its_.row), result);
}

TEST_P(StoreAddTest, LeavesOtherKeysOfTheResult) {
  Json::Value result;
  result[its_.key] = "stale";
  result["other"] = "kept";
  EXPECT_EQ(1, add_.run(*store_, 0, its_.row, result));
  Json::Value expected = secretsOf(its_.row);
  expected["other"] = "kept";
  EXPECT_EQ(expected, result);
}

TEST_P(StoreAddTest, ReturnsSecretsWithTheirQuotesAsGiven) {
  Row row = its_.row;
  for (const std::string& column : its_.secrets) row[column].front() = '\'';
  Json::Value result;
  EXPECT_EQ(1, add_.run(*store_, 0, row, result));
  EXPECT_EQ(secretsOf(row), result);
}

TEST_P(StoreAddTest, FindsTheTableFullAtItsCeiling) {
  setCeiling(2);
  for (const Change& change : adds()) {
    SCOPED_TRACE(change.label);
    emptyTable();
    EXPECT_EQ(1, run(change, *store_, numbered('1')));
    EXPECT_EQ(1, run(change, *store_, numbered('2')));
    const Lines before = everyRow();
    log_.clear();
    Json::Value result;
    EXPECT_EQ(0, change.run(*store_, 0, numbered('3'), result));
    expectFull(*store_);
    EXPECT_EQ(Json::Value(), result);
    EXPECT_EQ(before, everyRow());
  }
}

TEST_P(StoreAddTest, ReadsTheCeilingAfreshEveryTime) {
  setCeiling(1);
  EXPECT_EQ(1, run(add_, *store_, numbered('1')));
  setCeiling(2);
  EXPECT_EQ(1, run(add_, *store_, numbered('2')));
}

TEST_P(StoreAddTest, ReportsAFullTableBeforeABadLength) {
  setCeiling(1);
  EXPECT_EQ(1, run(add_, *store_, its_.row));
  for (const Field& field : add_.fields) {
    if (field.max == 0) continue;
    SCOPED_TRACE(field.column);
    recordEarlierError(*store_);
    log_.clear();
    EXPECT_EQ(0, run(add_, *store_, with(its_.row, field.column, "")));
    expectFull(*store_);
  }
}

TEST_P(StoreAddTest, TakesATableItCannotCountForFull) {
  store_->SetTabName("elsewhere");
  EXPECT_EQ(0, run(add_, *store_, its_.row));
  expectError(*store_, kErrTableFull, its_.full);
  EXPECT_THAT(log_.lines(), ElementsAre(base("Run Command failed!![no such table: elsewhere][1]"),
                                        base("Get Row Count failed[elsewhere]"),
                                        base("Check Row Max failed[elsewhere]"), own(its_.full)));
}

TEST_P(StoreAddTest, LeavesItsSecretsInTheResultOfAFailedInsert) {
  EXPECT_EQ(1, run(add_, *store_, its_.row));
  const Row second = with(its_.other, its_.key, its_.row.at(its_.key));
  Json::Value result;
  EXPECT_EQ(0, add_.run(*store_, 0, second, result));
  EXPECT_EQ(secretsOf(second), result);
  const std::string error = "UNIQUE constraint failed: " + its_.table + "." + its_.key;
  expectError(*store_, 19, error);
  EXPECT_THAT(log_.lines(), ElementsAreArray(failed("Add", error, 19)));
  EXPECT_THAT(rows(), ElementsAre(printed(its_.row)));
}

// --- Add with secrets of its own ---

class StoreIssueTest : public DescribedStoreTest {
 protected:
  StoreIssueTest() {
    for (const Change& change : adds())
      if (!drawnBy(change).empty()) forms_.push_back(change);
  }
  // What the form does not take from its caller.
  std::set<std::string> drawnBy(const Change& form) const {
    std::set<std::string> result(its_.secrets.begin(), its_.secrets.end());
    for (const Field& field : form.fields) result.erase(field.column);
    return result;
  }
  std::vector<Change> forms_;
  std::shared_ptr<Store> store_ = its_.open();
};
INSTANTIATE_TEST_SUITE_P(, StoreIssueTest, kKeyedStores, tableName);

TEST_P(StoreIssueTest, DrawsNewSecretsEveryTime) {
  std::set<std::string> secrets;
  std::size_t count = 0;
  for (const Change& form : forms_)
    for (int i = 0; i < 2; ++i) {
      SCOPED_TRACE(form.label);
      Json::Value result;
      EXPECT_EQ(1, form.run(*store_, 0, its_.row, result));
      EXPECT_THAT(result.getMemberNames(), ElementsAreArray(its_.secrets));
      for (const std::string& column : drawnBy(form)) {
        EXPECT_THAT(result[column].asString(), MatchesRegex("[0-9a-f]{64}"));
        secrets.insert(result[column].asString());
        ++count;
      }
    }
  EXPECT_GT(count, 0U);
  EXPECT_EQ(count, secrets.size());
}

TEST_P(StoreIssueTest, StoresWhatItReturns) {
  for (const Change& form : forms_) {
    SCOPED_TRACE(form.label);
    emptyTable();
    Json::Value result;
    EXPECT_EQ(1, form.run(*store_, 0, its_.row, result));
    Row expected = its_.row;
    for (const std::string& column : drawnBy(form)) expected[column] = result[column].asString();
    EXPECT_THAT(rows(), ElementsAre(printed(expected)));
    EXPECT_EQ(secretsOf(expected), result);
    EXPECT_THAT(log_.lines(), IsEmpty());
  }
}

// A secret that can be guessed is worse than no secret.
TEST_P(StoreIssueTest, IssuesNothingWithoutRandomBytes) {
  files_.failRandomCall(ENOSYS);
  files_.removeRandomDevice();
  for (const Change& form : forms_) {
    SCOPED_TRACE(form.label);
    recordEarlierError(*store_);
    log_.clear();
    Json::Value result;
    EXPECT_EQ(0, form.run(*store_, 0, its_.row, result));
    expectBadParameters(*store_);
    EXPECT_EQ(0U, result.size());
    EXPECT_EQ(0, rowCount());
  }
}

// --- Addresses ---

class StoreAddressTest : public DescribedStoreTest {
 protected:
  // Refused in the log alone, with the error as it was.
  void expectBadAddress(const Change& change, const Row& row) {
    recordEarlierError(*store_);
    log_.clear();
    Json::Value result;
    EXPECT_EQ(0, change.run(*store_, 0, row, result));
    expectEarlierError(*store_);
    EXPECT_EQ(Json::Value(), result);
    EXPECT_THAT(log_.lines(), ElementsAre(own("Bad IP address[Invalid argument]")));
    EXPECT_THAT(log_.formats(), ElementsAre("%s:%d Bad IP address[%s]"));
    EXPECT_THAT(rows(), IsEmpty());
  }
  std::shared_ptr<Store> store_ = its_.open();
};
INSTANTIATE_TEST_SUITE_P(, StoreAddressTest, kExpiringStores, tableName);

TEST_P(StoreAddressTest, AcceptsBothFamiliesOrNothing) {
  for (const Change& change : adds())
    for (const std::string& ip :
         {std::string(), std::string("192.168.1.20"), std::string("0.0.0.0"),
          std::string("255.255.255.255"), std::string("::"), std::string("::1"),
          std::string("2001:DB8::7"), std::string("::ffff:192.0.2.7"),
          std::string("2001:0db8:0000:0000:0000:0000:0000:0007"), std::string("fe80::1%1"),
          std::string("fe80::1%lo"), std::string("fe80::1%no-such-interface"),
          std::string("2001:db8::7%4294967295"), std::string("fe80::1%"),
          std::string("::1%\x1b[2J"), "fe80::1%" + times(5000, 'i')}) {
      SCOPED_TRACE(change.label + " with " + ip);
      emptyTable();
      EXPECT_EQ(1, run(change, *store_, with(its_.row, "ip", ip)));
      EXPECT_EQ(ip, stored("ip"));
      EXPECT_THAT(log_.lines(), IsEmpty());
    }
}

TEST_P(StoreAddressTest, RefusesAnythingElse) {
  for (const Change& change : adds())
    for (const std::string& ip : {std::string("example"),
                                  std::string("300.1.1.1"),
                                  std::string("None"),
                                  std::string("1.2.3"),
                                  std::string("1.2.3.4.5"),
                                  std::string(" 192.0.2.7"),
                                  std::string("192.0.2.7 "),
                                  std::string("192.0.2.7:80"),
                                  std::string("192.0.2.7/24"),
                                  std::string("192.0.2.7%1"),
                                  std::string("[::1]"),
                                  std::string("::1::"),
                                  std::string("1:2:3:4:5:6:7:8:9"),
                                  std::string("fe80::g"),
                                  std::string("%"),
                                  std::string("%lo"),
                                  std::string("'"),
                                  std::string(1, '\0'),
                                  std::string(1, '\0') + "192.0.2.7",
                                  times(5000, '1'),
                                  times(5000, ':') + "%1"}) {
      SCOPED_TRACE(change.label + " with " + ip);
      expectBadAddress(change, with(its_.row, "ip", ip));
    }
}

TEST_P(StoreAddressTest, NamesTheParseErrorWhateverErrnoSaidBefore) {
  errno = ENOENT;
  expectBadAddress(its_.changes.front(), with(its_.row, "ip", "example"));
}

TEST_P(StoreAddressTest, IsCheckedBeforeTheLengths) {
  expectBadAddress(its_.changes.front(), with(with(its_.row, "ip", "example"), "username", ""));
}

TEST_P(StoreAddressTest, IsCheckedAfterTheCeiling) {
  setCeiling(1);
  EXPECT_EQ(1, run(its_.changes.front(), *store_, its_.row));
  EXPECT_EQ(0, run(its_.changes.front(), *store_, with(its_.row, "ip", "example")));
  expectFull(*store_);
}

// --- Del ---

class StoreDelTest : public DescribedStoreTest {};
INSTANTIATE_TEST_SUITE_P(, StoreDelTest, kKeyedStores, tableName);

TEST_P(StoreDelTest, TellsIdsApartBeyond32Bits) {
  const auto store = its_.open();
  for (const Removal& removal : its_.removals) {
    SCOPED_TRACE(removal.traces.front());
    emptyTable();
    for (const char* const id :
         {"-1", "0", "1", "2147483648", "4294967296", "4294967297", "9223372036854775807"})
      insertRow(id);
    recordEarlierError(*store);
    for (const long long id : {4294967297LL, 9223372036854775807LL, 2147483648LL, 0LL})
      EXPECT_EQ(1, removal.run(*store, id));
    EXPECT_THAT(ids(), ElementsAre("-1", "1", "4294967296"));
    expectEarlierError(*store);
    EXPECT_THAT(log_.lines(), IsEmpty());
  }
}

TEST_P(StoreDelTest, FailsWithoutSuchARow) {
  const auto store = its_.open();
  insertRow("1");
  for (const Removal& removal : its_.removals) {
    SCOPED_TRACE(removal.traces.front());
    recordEarlierError(*store);
    log_.clear();
    EXPECT_EQ(0, removal.run(*store, 4294967297LL));
    expectEarlierError(*store);
    EXPECT_THAT(log_.lines(), ElementsAreArray(failed("Delete")));
    EXPECT_THAT(ids(), ElementsAre("1"));
  }
}

TEST_P(StoreDelTest, TracesEveryStep) {
  for (const Removal& removal : its_.removals) {
    createDatabase();
    insertRow("4294967297");
    Lines expected;
    for (const std::string& name : removal.traces) expected.push_back(own("==> " + name));
    for (const std::string& text :
         {std::string("==> DBDel"), std::string("==> GetConditionParam"),
          std::string("==> ConcateParam"), std::string("==> DBCmd"),
          "==> DBCmdRun[DELETE FROM " + its_.table + " WHERE id='4294967297';]",
          std::string("ClientInfo Delete success, changed[1]")})
      expected.push_back(base(text));
    EXPECT_THAT(traced(15, [&](Store& store) { EXPECT_EQ(1, removal.run(store, 4294967297LL)); }),
                ElementsAreArray(expected));
  }
}

class StoreFailureTest : public DescribedStoreTest {};
INSTANTIATE_TEST_SUITE_P(, StoreFailureTest, kEveryStore, tableName);

TEST_P(StoreFailureTest, ReportsAFailedDelete) {
  const auto store = its_.open();
  insertRow("1");
  refuseDeletes();
  for (const Removal& removal : its_.removals) {
    SCOPED_TRACE(removal.traces.front());
    recordEarlierError(*store);
    log_.clear();
    EXPECT_EQ(0, removal.run(*store, 1));
    expectError(*store, 19, "kept");
    EXPECT_THAT(log_.lines(), ElementsAreArray(failed("Delete", "kept", 19)));
    EXPECT_THAT(ids(), ElementsAre("1"));
  }
}

// --- Look-ups ---

class StoreGetTest : public DescribedStoreTest {
 protected:
  std::shared_ptr<Store> store_ = its_.open();
  Json::Value rows_ = "before";
};
INSTANTIATE_TEST_SUITE_P(, StoreGetTest, kKeyedStores, tableName);

TEST_P(StoreGetTest, FindsTheRowsOfAText) {
  for (const Lookup& lookup : its_.lookups) {
    SCOPED_TRACE(lookup.name);
    emptyTable();
    insert("1", with(its_.other, lookup.column, times(64, '1')));
    insert("2", its_.row);
    EXPECT_EQ(1, lookup.run(*store_, its_.row.at(lookup.column), &rows_));
    EXPECT_EQ(list({document(its_.row, "2")}), rows_);
    EXPECT_THAT(log_.lines(), IsEmpty());
  }
}

TEST_P(StoreGetTest, FindsARowById) {
  insertRow("1");
  for (const long long id : {2147483648LL, 4294967297LL, 9223372036854775807LL, -5LL}) {
    SCOPED_TRACE(id);
    const Row row = insertRow(std::to_string(id));
    EXPECT_EQ(1, its_.getById(*store_, id, &rows_));
    EXPECT_EQ(list({document(row, std::to_string(id))}), rows_);
  }
}

TEST_P(StoreGetTest, ReadsTheWholeTable) {
  const Row first = insertRow("1");
  insert("2", its_.other);
  EXPECT_EQ(1, its_.getAll(*store_, &rows_));
  EXPECT_EQ(list({document(first, "1"), document(its_.other, "2")}), rows_);
}

TEST_P(StoreGetTest, DeliversAColumnThatALaterVersionAdded) {
  Row row = insertRow("1");
  execute("ALTER TABLE " + its_.table + " ADD COLUMN later text DEFAULT 'new'");
  row["later"] = "new";
  EXPECT_EQ(1, its_.getAll(*store_, &rows_));
  EXPECT_EQ(list({document(row, "1")}), rows_);
}

TEST_P(StoreGetTest, SucceedsWithoutARow) {
  const Json::Value none(Json::arrayValue);
  recordEarlierError(*store_);
  for (const Lookup& lookup : its_.lookups) {
    rows_ = "before";
    EXPECT_EQ(1, lookup.run(*store_, times(64), &rows_));
    EXPECT_EQ(none, rows_);
  }
  rows_ = "before";
  EXPECT_EQ(1, its_.getById(*store_, 1, &rows_));
  EXPECT_EQ(none, rows_);
  rows_ = "before";
  EXPECT_EQ(1, its_.getAll(*store_, &rows_));
  EXPECT_EQ(none, rows_);
  expectEarlierError(*store_);
  EXPECT_THAT(log_.lines(), IsEmpty());
}

// Codes report this as an error too, unlike the bad lengths of their changes.
TEST_P(StoreGetTest, AcceptsTextsOf64BytesOnly) {
  for (const Lookup& lookup : its_.lookups)
    for (const int length : {0, 63, 65, 100000}) {
      SCOPED_TRACE(lookup.name + " of " + std::to_string(length) + " bytes");
      recordEarlierError(*store_);
      log_.clear();
      EXPECT_EQ(0, lookup.run(*store_, times(length), &rows_));
      EXPECT_EQ(Json::Value("before"), rows_);
      expectError(*store_, kErrBadParameters, "Bad parameters");
      EXPECT_THAT(log_.lines(), ElementsAre(own("Bad parameters")));
      EXPECT_THAT(log_.formats(), ElementsAre("%s:%d Bad parameters"));
    }
  EXPECT_THAT(host_.calls(), IsEmpty());
}

TEST_P(StoreGetTest, FindsAQuoteThatAddStoredUnlessTakenAsGiven) {
  Row row = its_.row;
  for (const std::string& column : its_.secrets) row[column].front() = '\'';
  EXPECT_EQ(1, run(its_.changes.front(), *store_, row));
  Row found = row;
  for (const std::string& column : its_.secrets) found[column] = doubled(row[column]);
  for (const Lookup& lookup : its_.lookups) {
    SCOPED_TRACE(lookup.name);
    EXPECT_EQ(1, lookup.run(*store_, row[lookup.column], &rows_));
    EXPECT_EQ(lookup.asGiven ? list({}) : list({document(found, "1")}), rows_);
  }
}

TEST_P(StoreGetTest, FindsNoSingleStoredQuoteUnlessTakenAsGiven) {
  Row row = its_.row;
  for (const std::string& column : its_.secrets) row[column].front() = '\'';
  insert("1", row);
  for (const Lookup& lookup : its_.lookups) {
    SCOPED_TRACE(lookup.name);
    EXPECT_EQ(1, lookup.run(*store_, row[lookup.column], &rows_));
    EXPECT_EQ(lookup.asGiven ? list({document(row, "1")}) : list({}), rows_);
  }
}

TEST_P(StoreGetTest, TakesWildcardsLiterally) {
  insertRow("1");
  for (const Lookup& lookup : its_.lookups)
    for (const char wildcard : {'%', '_', '*', '?'}) {
      SCOPED_TRACE(wildcard);
      EXPECT_EQ(1, lookup.run(*store_, times(64, wildcard), &rows_));
      EXPECT_EQ(list({}), rows_);
    }
}

TEST_P(StoreGetTest, EndsATextAtItsFirstNulUnlessTakenAsGiven) {
  Row row = its_.row;
  for (const std::string& column : its_.secrets) row[column][10] = '\0';
  EXPECT_EQ(1, run(its_.changes.front(), *store_, row));
  Row found = row;
  for (const std::string& column : its_.secrets) found[column].resize(10);
  for (const Lookup& lookup : its_.lookups) {
    SCOPED_TRACE(lookup.name);
    EXPECT_EQ(lookup.asGiven ? 0 : 1, lookup.run(*store_, row[lookup.column], &rows_));
    EXPECT_EQ(lookup.asGiven ? list({}) : list({document(found, "1")}), rows_);
    if (!lookup.asGiven) continue;
    EXPECT_EQ(1, store_->GetErrCode());
    EXPECT_THAT(log_.lines(),
                ElementsAre(StartsWith(base("Run Command failed!![unrecognized token: \"'")),
                            failed("Get").front()));
  }
}

TEST_P(StoreGetTest, DeliversAValueThatCannotBeDecryptedAsStored) {
  const std::string column = its_.key == "client_id" ? "client_secret" : "client_id";
  const Row row = insertRow("1");
  execute("UPDATE " + its_.table + " SET " + column + " = 'plain'");
  const Json::Value expected = list({document(with(row, column, "plain"), "1")});
  EXPECT_EQ(1, its_.getAll(*store_, &rows_));
  EXPECT_EQ(expected, rows_);
  EXPECT_EQ(1, its_.lookups.front().run(*store_, row.at(its_.key), &rows_));
  EXPECT_EQ(expected, rows_);
  expectError(*store_, kErrNone, "");
  const std::string first = base("Data Decrypt failed"), second = base("Decrypt data failed");
  EXPECT_THAT(log_.lines(), ElementsAre(first, second, first, second));
}

TEST_P(StoreGetTest, TracesEveryStepOfALookup) {
  createDatabase();
  const Row row = insertRow("1");
  for (const Lookup& lookup : its_.lookups)
    EXPECT_THAT(traced(15,
                       [&](Store& store) {
                         EXPECT_EQ(1, lookup.run(store, row.at(lookup.column), &rows_));
                       }),
                ElementsAreArray(traceOf(lookup, row, "1")));
}

TEST_P(StoreGetTest, TracesReadsWithoutAText) {
  EXPECT_THAT(
      traced(8,
             [&](Store& store) {
               its_.getById(store, 1, &rows_);
               its_.getAll(store, &rows_);
             }),
      ElementsAre(own("==> Get"), base("==> DBGet"), base("==> GetConditionParam"),
                  base("==> ConcateParam"), base("==> DBCmd"),
                  base("==> DBCmdRun[SELECT * FROM " + its_.table + " WHERE id='1' ;]"),
                  own("==> Get"), base("==> DBGet"), base("==> GetConditionParam"),
                  base("==> DBCmd"), base("==> DBCmdRun[SELECT * FROM " + its_.table + " ;]")));
}

TEST_P(StoreFailureTest, ReportsAFailedRead) {
  const auto store = its_.open();
  dropTable();
  std::vector<std::function<int(Json::Value*)>> reads{
      [&](Json::Value* rows) { return its_.getAll(*store, rows); }};
  if (its_.getById)
    reads.emplace_back([&](Json::Value* rows) { return its_.getById(*store, 1, rows); });
  for (const Lookup& lookup : its_.lookups)
    reads.emplace_back([&](Json::Value* rows) { return lookup.run(*store, times(64), rows); });
  const std::string error = "no such table: " + its_.table;
  for (const auto& read : reads) {
    recordEarlierError(*store);
    log_.clear();
    Json::Value rows("before");
    EXPECT_EQ(0, read(&rows));
    EXPECT_EQ(list({}), rows);
    expectError(*store, 1, error);
    EXPECT_THAT(log_.lines(), ElementsAreArray(failed("Get", error, 1)));
  }
}

// --- GetIndex ---

class StoreIndexTest : public DescribedStoreTest {
 protected:
  std::shared_ptr<Store> store_ = its_.open();
};
INSTANTIATE_TEST_SUITE_P(, StoreIndexTest, kKeyedStores, tableName);

TEST_P(StoreIndexTest, IsTheLow32BitsOfTheId) {
  const std::pair<const char*, int> cases[] = {
      {"1", 1},
      {"2147483647", 2147483647},
      {"2147483648", std::numeric_limits<int>::min()},
      {"4294967295", -1},
      {"4294967296", 0},
      {"4294967301", 5},
      {"9223372036854775807", -1},
      {"-7", -7},
  };
  for (const auto& [id, index] : cases)
    EXPECT_EQ(index, its_.getIndex(*store_, insertRow(id).at(its_.key))) << id;
}

TEST_P(StoreIndexTest, IsZeroForAnUnknownText) {
  EXPECT_EQ(0, its_.getIndex(*store_, times(64)));
  expectError(*store_, kErrNone, "");
  EXPECT_THAT(log_.lines(), IsEmpty());
}

TEST_P(StoreIndexTest, IsZeroForABadLength) {
  for (const int length : {0, 63, 65}) {
    log_.clear();
    EXPECT_EQ(0, its_.getIndex(*store_, times(length)));
    expectError(*store_, kErrBadParameters, "Bad parameters");
    EXPECT_THAT(log_.lines(), ElementsAre(own("Bad parameters")));
  }
}

TEST_P(StoreIndexTest, IsZeroAfterAFailedRead) {
  dropTable();
  EXPECT_EQ(0, its_.getIndex(*store_, times(64)));
  const std::string error = "no such table: " + its_.table;
  expectError(*store_, 1, error);
  EXPECT_THAT(log_.lines(), ElementsAreArray(failed("Get", error, 1)));
}

TEST_P(StoreIndexTest, TracesTheLookupToo) {
  const Row row = insertRow("1");
  Lines expected = traceOf(its_.lookups.front(), row, "1");
  expected.insert(expected.begin(), own("==> GetIndex"));
  EXPECT_THAT(
      traced(15, [&](Store& store) { EXPECT_EQ(1, its_.getIndex(store, row.at(its_.key))); }),
      ElementsAreArray(expected));
}

// --- Expiry ---

class StoreExpiryTest : public DescribedStoreTest {
 protected:
  std::shared_ptr<Store> store_ = its_.open();
};
INSTANTIATE_TEST_SUITE_P(, StoreExpiryTest, kExpiringStores, tableName);

TEST_P(StoreExpiryTest, IsSetByTheSetting) {
  const std::string other =
      its_.lifetime == "token_expired" ? "grantcode_expired" : "token_expired";
  const std::pair<std::string, const char*> cases[] = {
      {"{}", "1700000600"},
      {"{\"" + its_.lifetime + "\": 1}", "1700000001"},
      {"{\"" + its_.lifetime + "\": 0}", "1700000600"},
      {"{\"" + its_.lifetime + "\": -5}", "1700000600"},
      {"{\"" + its_.lifetime + "\": 3600, \"" + other + "\": 5}", "1700003600"},
      {"{\"" + its_.lifetime + "\": 2147483647}", "3847483647"},
  };
  for (const auto& [settings, expiry] : cases) {
    SCOPED_TRACE(settings);
    emptyTable();
    writeSettings(settings);
    EXPECT_EQ(1, run(its_.changes.at(1), *store_, its_.row));
    EXPECT_EQ(expiry, stored("expired_time"));
  }
}

TEST_P(StoreExpiryTest, CountsPast2038) {
  if (sizeof(std::time_t) < 8) GTEST_SKIP() << "this system's own time ends in 2038";
  for (const std::int64_t now : {2'147'483'647LL, 4'294'967'296LL}) {
    clock_.set(now);
    EXPECT_EQ(1, run(its_.changes.at(1), *store_, its_.row));
    EXPECT_EQ(std::to_string(now + 600), stored("expired_time"));
    clock_.advance(600);
    EXPECT_EQ(1, its_.purge(*store_));
    EXPECT_EQ(1, rowCount());
    clock_.advance(1);
    EXPECT_EQ(1, its_.purge(*store_));
    EXPECT_EQ(0, rowCount());
  }
}

TEST_P(StoreExpiryTest, HidesNoRowFromLookups) {
  const Row row = insertExpiring("1", "1");
  for (const Lookup& lookup : its_.lookups) {
    Json::Value rows;
    EXPECT_EQ(1, lookup.run(*store_, row.at(lookup.column), &rows));
    EXPECT_EQ(list({document(row, "1")}), rows);
  }
}

// --- Purge ---

class StorePurgeTest : public DescribedStoreTest {
 protected:
  std::shared_ptr<Store> store_ = its_.open();
};
INSTANTIATE_TEST_SUITE_P(, StorePurgeTest, kExpiringStores, tableName);

TEST_P(StorePurgeTest, DeletesExactlyTheExpiredRows) {
  recordEarlierError(*store_);
  insertExpiring("1", "1699999999");
  insertExpiring("2", "1700000000");
  insertExpiring("3", "1");
  insertExpiring("4", "1700000001");
  EXPECT_EQ(1, its_.purge(*store_));
  EXPECT_THAT(ids(), ElementsAre("2", "4"));
  expectEarlierError(*store_);
  EXPECT_THAT(log_.lines(), IsEmpty());
}

TEST_P(StorePurgeTest, SucceedsOnAnEmptyTable) {
  EXPECT_EQ(1, its_.purge(*store_));
  EXPECT_THAT(log_.lines(), IsEmpty());
}

TEST_P(StorePurgeTest, ComparesTheExpiryAsANumber) {
  for (const auto& [expiry, valid] : kExpiries) {
    SCOPED_TRACE("'" + expiry + "'");
    emptyTable();
    insertExpiring("1", expiry);
    EXPECT_EQ(1, its_.purge(*store_));
    EXPECT_EQ(valid ? 1 : 0, rowCount());
  }
}

TEST_P(StorePurgeTest, ComparesClocksBeforeTheEpochWithTheirSign) {
  insertExpiring("1", "-11");
  insertExpiring("2", "-10");
  insertExpiring("3", "0");
  clock_.set(-10);
  EXPECT_EQ(1, its_.purge(*store_));
  EXPECT_THAT(ids(), ElementsAre("2", "3"));
}

TEST_P(StorePurgeTest, TellsIdsApartBeyond32Bits) {
  insertRow("1");
  insertExpiring("4294967297", "1");
  insertExpiring("9223372036854775807", "1");
  EXPECT_EQ(1, its_.purge(*store_));
  EXPECT_THAT(ids(), ElementsAre("1"));
}

TEST_P(StorePurgeTest, GoesOnAfterAFailedDelete) {
  for (const std::string kept : {"1", "2", "3"}) {
    emptyTable();
    for (const char* const id : {"1", "2", "3"}) insertExpiring(id, "1");
    refuseDeletes("OLD.id = " + kept);
    log_.clear();
    EXPECT_EQ(0, its_.purge(*store_));
    EXPECT_THAT(ids(), ElementsAre(kept));
    expectError(*store_, 19, "kept");
    EXPECT_THAT(log_.lines(), ElementsAreArray(failed("Delete", "kept", 19)));
    execute("DROP TRIGGER refusal");
  }
}

TEST_P(StorePurgeTest, CountsAFailedReadAsSuccess) {
  dropTable();
  EXPECT_EQ(1, its_.purge(*store_));
  const std::string error = "no such table: " + its_.table;
  expectError(*store_, 1, error);
  EXPECT_THAT(log_.lines(), ElementsAreArray(failed("Get", error, 1)));
}

TEST_P(StorePurgeTest, DeletesNothingAfterAReadThatFailsHalfway) {
  insertExpiring("1", "1");
  insertExpiring("2", "1");
  std::string columns;
  for (const std::string& column : its_.columns)
    columns += column == "scope" ? "CASE id WHEN 2 THEN abs(-9223372036854775807 - 1) ELSE scope "
                                   "END AS scope, "
                                 : column + ", ";
  execute("ALTER TABLE " + its_.table + " RENAME TO kept; CREATE VIEW " + its_.table +
          " AS SELECT " + columns + "id FROM kept");
  EXPECT_EQ(1, its_.purge(*store_));
  EXPECT_EQ(2, StoreTest::rowCount("kept"));
  EXPECT_THAT(log_.lines(), ElementsAreArray(failed("Get", "integer overflow", 1)));
}

TEST_P(StorePurgeTest, TracesEveryDelete) {
  insertRow("1");
  insertExpiring("2", "1");
  const Lines lines = traced(9, [&](Store& store) { EXPECT_EQ(1, its_.purge(store)); });
  EXPECT_THAT(
      lines,
      ElementsAre(own("==> Purge"), base("==> DBCmd"), base("==> DBCmdRun[BEGIN IMMEDIATE;]"),
                  own("==> Get"), base("==> DBGet"), base("==> GetConditionParam"),
                  base("==> DBCmd"), base("==> DBCmdRun[SELECT * FROM " + its_.table + " ;]"),
                  base("==> TabGetCallback"), base("==> ParamDecrypt[client_id]"),
                  base("==> TabGetCallback"), base("==> ParamDecrypt[client_id]"),
                  base("ClientInfo Get Done"), own("==> Del"), base("==> DBDel"),
                  base("==> GetConditionParam"), base("==> ConcateParam"), base("==> DBCmd"),
                  base("==> DBCmdRun[DELETE FROM " + its_.table + " WHERE id='2';]"),
                  base("ClientInfo Delete success, changed[1]"), base("==> DBCmd"),
                  base("==> DBCmdRun[COMMIT;]")));
}

// --- A store that could not be opened ---

class UnopenedStoreTest : public DescribedStoreTest {
 protected:
  UnopenedStoreTest() { files_.removeDirectory(); }

  void expectRefusal(int result, const Lines& lines, const std::function<int(Store&)>& operation,
                     int code = kErrCreateTable, const std::string& msg = "Create table failed") {
    const auto store = its_.open();
    expectError(*store, kErrCreateTable, "Create table failed");
    log_.clear();
    EXPECT_EQ(result, operation(*store));
    EXPECT_THAT(log_.lines(), ElementsAreArray(lines));
    expectError(*store, code, msg);
  }
};
class UnopenedKeyedStoreTest : public UnopenedStoreTest {};
class UnopenedExpiringStoreTest : public UnopenedStoreTest {};
INSTANTIATE_TEST_SUITE_P(, UnopenedStoreTest, kEveryStore, tableName);
INSTANTIATE_TEST_SUITE_P(, UnopenedKeyedStoreTest, kKeyedStores, tableName);
INSTANTIATE_TEST_SUITE_P(, UnopenedExpiringStoreTest, kExpiringStores, tableName);

TEST_P(UnopenedStoreTest, RefusesToDelete) {
  for (const Removal& removal : its_.removals)
    expectRefusal(0, unready("Delete"), [&](Store& store) { return removal.run(store, 1); });
}

TEST_P(UnopenedStoreTest, RefusesToRead) {
  Json::Value rows("before");
  expectRefusal(0, unready("Get"), [&](Store& store) { return its_.getAll(store, &rows); });
  EXPECT_EQ(list({}), rows);
  for (const Lookup& lookup : its_.lookups)
    expectRefusal(0, unready("Get"),
                  [&](Store& store) { return lookup.run(store, times(64), &rows); });
}

TEST_P(UnopenedKeyedStoreTest, RefusesToAdd) {
  Lines expected;
  if (its_.opensTheAuditLog)
    expected = {base("Open DB failed!![14]"), base("Run Command failed!![][21]"),
                base("Run Command failed!![][21]"), base("Create Table failed!![meta]")};
  for (const std::string& line :
       {base("DB is not ready!!"), base("Get Row Count failed[" + its_.table + "]"),
        base("Check Row Max failed[" + its_.table + "]"), own(its_.full)})
    expected.push_back(line);
  for (const Change& change : adds()) {
    Json::Value result;
    expectRefusal(
        0, expected, [&](Store& store) { return change.run(store, 0, its_.row, result); },
        kErrTableFull, its_.full);
    EXPECT_EQ(Json::Value(), result);
  }
}

TEST_P(UnopenedKeyedStoreTest, RefusesToEdit) {
  for (const Change& change : edits())
    expectRefusal(0, unready("Edit"), [&](Store& store) { return run(change, store, its_.row); });
}

TEST_P(UnopenedKeyedStoreTest, StillChecksLengthsFirst) {
  for (const Change& change : edits()) {
    if (change.fields.empty()) continue;
    const auto store = its_.open();
    recordEarlierError(*store);
    log_.clear();
    EXPECT_EQ(0, run(change, *store, with(its_.row, change.fields.front().column, "")));
    expectBadParameters(*store);
  }
}

TEST_P(UnopenedKeyedStoreTest, RefusesToReadById) {
  Json::Value rows;
  expectRefusal(0, unready("Get"), [&](Store& store) { return its_.getById(store, 1, &rows); });
}

TEST_P(UnopenedKeyedStoreTest, HasNoIndex) {
  expectRefusal(0, unready("Get"), [&](Store& store) { return its_.getIndex(store, times(64)); });
}

TEST_P(UnopenedExpiringStoreTest, CountsAPurgeAsSuccess) {
  expectRefusal(1, unready("Get"), [&](Store& store) { return its_.purge(store); });
}

}  // namespace
