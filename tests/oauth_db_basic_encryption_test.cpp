
#include <stdexcept>

#include "json_text.h"
#include "oauth_clientInfo.h"
#include "oauth_db_basic.h"
#include "oauth_grantCode.h"
#include "oauth_token.h"
#include "store_test.h"

using testing::ElementsAre;
using testing::IsEmpty;
using ZEVOOAUTHSERVER::OAUTHDBBasic;
using ZEVOOAUTHSERVER::OAUTHDBClientInfo;
using ZEVOOAUTHSERVER::OAUTHDBGrantCode;
using ZEVOOAUTHSERVER::OAUTHDBToken;

namespace {

// --- A document ---

class EncryptionTest : public StoreTest {
 protected:
  bool encrypt(const std::string& document) { return store_.ParamEncrypt(doc_ = parse(document)); }
  bool decrypt(const std::string& document) { return store_.ParamDecrypt(doc_ = parse(document)); }
  // The calls of the host's cipher since newCalls() was last called.
  std::vector<std::string> newCalls() {
    const auto& all = host_.calls();
    std::vector<std::string> found(all.begin() + static_cast<std::ptrdiff_t>(seen_), all.end());
    seen_ = all.size();
    return found;
  }

  OAUTHDBBasic store_;
  Json::Value doc_;

 private:
  std::size_t seen_ = 0;
};

constexpr const char* kUntouched[] = {
    "{}",
    R"({"id":5,"scope":"read"})",
    R"({"access_token":"sealed:a","code":"sealed:b","refresh_token":"sealed:c"})",
    // Other names are not sensitive.
    R"({"CLIENT_ID":"sealed:a","Client_Secret":"sealed:b"})",
    R"({"client":"sealed:a","client_id ":"sealed:b","client_id2":"sealed:c"})",
    // Members below the top level are not converted.
    R"({"condition":{"client_id":"sealed:a","client_secret":"sealed:b"}})",
    R"({"modified":[{"client_id":"sealed:a"}]})",
    // A document that is not an object has no members.
    "null",
    "true",
    "5",
    "2.5",
    R"("client_id")",
    "[]",
    R"([{"client_id":"sealed:a"}])",
    R"(["client_id","client_secret"])",
};

TEST_F(EncryptionTest, LeavesADocumentWithoutSensitiveMembers) {
  for (const char* const document : kUntouched) {
    EXPECT_TRUE(encrypt(document)) << document;
    EXPECT_EQ(document, text(doc_));
    EXPECT_TRUE(decrypt(document)) << document;
    EXPECT_EQ(document, text(doc_));
  }
  EXPECT_THAT(host_.calls(), IsEmpty());
  EXPECT_THAT(log_.lines(), IsEmpty());
}

struct Conversion {
  const char* before;
  const char* after;
  std::vector<std::string> calls;
};

// A value of another type is converted to text first.
TEST_F(EncryptionTest, ReplacesPlainMembers) {
  const Conversion conversions[] = {
      {R"({"client_id":"abc"})", R"({"client_id":"sealed:cba"})", {"encrypt abc 1024"}},
      {R"({"client_secret":"xyz"})", R"({"client_secret":"sealed:zyx"})", {"encrypt xyz 1024"}},
      {R"({"client_id":"abc","client_secret":"xyz","code":"abc","id":null})",
       R"({"client_id":"sealed:cba","client_secret":"sealed:zyx","code":"abc","id":null})",
       {"encrypt abc 1024", "encrypt xyz 1024"}},
      {R"({"client_secret":"it's"})", R"({"client_secret":"sealed:s'ti"})", {"encrypt it's 1024"}},
      {R"({"client_id":"sealed:a"})",
       R"({"client_id":"sealed:a:delaes"})",
       {"encrypt sealed:a 1024"}},
      {R"({"client_id":""})", R"({"client_id":"sealed:"})", {"encrypt  1024"}},
      {R"({"client_id":null})", R"({"client_id":"sealed:"})", {"encrypt  1024"}},
      {R"({"client_id":123})", R"({"client_id":"sealed:321"})", {"encrypt 123 1024"}},
  };
  for (const Conversion& row : conversions) {
    EXPECT_TRUE(encrypt(row.before)) << row.before;
    EXPECT_EQ(row.after, text(doc_)) << row.before;
    EXPECT_EQ(row.calls, newCalls()) << row.before;
  }
  EXPECT_THAT(log_.lines(), IsEmpty());
}

// The host reads a text only up to a NUL byte.
TEST_F(EncryptionTest, RefusesAValueWithANulByte) {
  for (const char* const document :
       {R"({"client_id":"a\u0000b"})", R"({"client_secret":"\u0000"})"}) {
    EXPECT_FALSE(encrypt(document));
    EXPECT_EQ(document, text(doc_));
    EXPECT_THAT(log_.lines(), ElementsAre("3 oauth_db_basic.cpp Data Encrypt failed"));
    log_.clear();
  }
  EXPECT_THAT(host_.calls(), IsEmpty());
}

TEST_F(EncryptionTest, ReplacesEncryptedMembers) {
  const Conversion conversions[] = {
      {R"({"client_id":"sealed:cba"})", R"({"client_id":"abc"})", {"decrypt sealed:cba 1024"}},
      {R"({"client_secret":"sealed:zyx"})",
       R"({"client_secret":"xyz"})",
       {"decrypt sealed:zyx 1024"}},
      {R"({"client_id":"sealed:cba","client_secret":"sealed:zyx","code":"sealed:a","id":"5"})",
       R"({"client_id":"abc","client_secret":"xyz","code":"sealed:a","id":"5"})",
       {"decrypt sealed:cba 1024", "decrypt sealed:zyx 1024"}},
      {R"({"client_id":"sealed:321"})", R"({"client_id":"123"})", {"decrypt sealed:321 1024"}},
      {R"({"client_id":"sealed:"})", R"({"client_id":""})", {"decrypt sealed: 1024"}},
      {R"({"client_id":"sealed:a\u0000b"})", R"({"client_id":"a"})", {"decrypt sealed:a 1024"}},
  };
  for (const Conversion& row : conversions) {
    EXPECT_TRUE(decrypt(row.before)) << row.before;
    EXPECT_EQ(row.after, text(doc_)) << row.before;
    EXPECT_EQ(row.calls, newCalls()) << row.before;
  }
  EXPECT_THAT(log_.lines(), IsEmpty());
}

TEST_F(EncryptionTest, IsUndoneByDecryption) {
  for (const std::string& plain : {std::string("abc"), std::string("it's 100% \"_\\"),
                                   std::string("Grüße, 東京"), times(64), std::string()}) {
    Json::Value doc;
    doc["client_id"] = doc["client_secret"] = plain;
    EXPECT_TRUE(store_.ParamEncrypt(doc)) << plain;
    EXPECT_EQ(FakeHost::sealed(plain), doc["client_id"].asString());
    EXPECT_TRUE(store_.ParamDecrypt(doc)) << plain;
    EXPECT_EQ(plain, doc["client_id"].asString());
    EXPECT_EQ(plain, doc["client_secret"].asString());
  }
}

// The host writes 7 bytes and the text, and needs one more for the NUL byte.
TEST_F(EncryptionTest, TakesAResultOf1023Bytes) {
  EXPECT_TRUE(encrypt(R"({"client_id":")" + times(1016) + R"("})"));
  EXPECT_EQ("sealed:" + times(1016), doc_["client_id"].asString());
}

TEST_F(EncryptionTest, FailsOnAResultOf1024Bytes) {
  EXPECT_FALSE(encrypt(R"({"client_id":")" + times(1017) + R"("})"));
  EXPECT_EQ(times(1017), doc_["client_id"].asString());
  EXPECT_THAT(log_.lines(), ElementsAre("3 oauth_db_basic.cpp Data Encrypt failed"));
}

// A host that leaves no NUL byte must not make the library read past its buffer.
TEST_F(EncryptionTest, TakesNoMoreThanTheBufferHolds) {
  host_.overfill();
  EXPECT_TRUE(encrypt(R"({"client_id":"abc"})"));
  EXPECT_EQ(times(1023, 'x'), doc_["client_id"].asString());
  EXPECT_TRUE(decrypt(R"({"client_id":"sealed:cba"})"));
  EXPECT_EQ(times(1023, 'x'), doc_["client_id"].asString());
}

TEST_F(EncryptionTest, LeavesTheSecretWhenTheIdentifierFails) {
  host_.failEncrypt(1);
  EXPECT_FALSE(encrypt(R"({"client_id":"abc","client_secret":"xyz"})"));
  EXPECT_EQ(R"({"client_id":"abc","client_secret":"xyz"})", text(doc_));
  EXPECT_THAT(host_.calls(), ElementsAre("encrypt abc 1024"));
  EXPECT_THAT(log_.lines(), ElementsAre("3 oauth_db_basic.cpp Data Encrypt failed"));
  EXPECT_THAT(log_.formats(), ElementsAre("%s:%d Data Encrypt failed"));
}

TEST_F(EncryptionTest, LeavesTheDocumentHalfDoneWhenTheSecretFails) {
  host_.failEncrypt(2);
  EXPECT_FALSE(encrypt(R"({"client_id":"abc","client_secret":"xyz"})"));
  EXPECT_EQ(R"({"client_id":"sealed:cba","client_secret":"xyz"})", text(doc_));
  EXPECT_THAT(host_.calls(), ElementsAre("encrypt abc 1024", "encrypt xyz 1024"));
  EXPECT_THAT(log_.lines(), ElementsAre("3 oauth_db_basic.cpp Data Encrypt failed"));
}

TEST_F(EncryptionTest, LeavesTheEncryptedSecretWhenTheIdentifierFails) {
  EXPECT_FALSE(decrypt(R"({"client_id":"abc","client_secret":"sealed:zyx"})"));
  EXPECT_EQ(R"({"client_id":"abc","client_secret":"sealed:zyx"})", text(doc_));
  EXPECT_THAT(host_.calls(), ElementsAre("decrypt abc 1024"));
  EXPECT_THAT(log_.lines(), ElementsAre("3 oauth_db_basic.cpp Data Decrypt failed"));
  EXPECT_THAT(log_.formats(), ElementsAre("%s:%d Data Decrypt failed"));
}

TEST_F(EncryptionTest, LeavesTheDocumentHalfPlainWhenTheSecretFails) {
  host_.failDecrypt(2);
  EXPECT_FALSE(decrypt(R"({"client_id":"sealed:cba","client_secret":"sealed:zyx"})"));
  EXPECT_EQ(R"({"client_id":"abc","client_secret":"sealed:zyx"})", text(doc_));
  EXPECT_THAT(host_.calls(), ElementsAre("decrypt sealed:cba 1024", "decrypt sealed:zyx 1024"));
  EXPECT_THAT(log_.lines(), ElementsAre("3 oauth_db_basic.cpp Data Decrypt failed"));
}

// --- Diagnostics ---

TEST_F(EncryptionTest, ReportsEachMember) {
  withDiagnostics(1, [&] {
    EXPECT_TRUE(encrypt(R"({"client_secret":"xyz","client_id":"abc"})"));
    EXPECT_TRUE(decrypt(R"({"client_secret":"sealed:zyx","client_id":"sealed:cba"})"));
  });
  EXPECT_THAT(log_.lines(), ElementsAre("3 oauth_db_basic.cpp ==> ParamEncrypt[client_id]",
                                        "3 oauth_db_basic.cpp ==> ParamEncrypt[client_secret]",
                                        "3 oauth_db_basic.cpp ==> ParamDecrypt[client_id]",
                                        "3 oauth_db_basic.cpp ==> ParamDecrypt[client_secret]"));
  EXPECT_THAT(log_.formats(),
              ElementsAre("%s:%d ==> %s[client_id]", "%s:%d ==> %s[client_secret]",
                          "%s:%d ==> %s[client_id]", "%s:%d ==> %s[client_secret]"));
}

TEST_F(EncryptionTest, ReportsOnlyWhatItTries) {
  host_.failEncrypt(1);
  withDiagnostics(1, [&] {
    EXPECT_FALSE(encrypt(R"({"client_id":"abc","client_secret":"xyz"})"));
    EXPECT_FALSE(decrypt(R"({"client_secret":"xyz"})"));
    EXPECT_TRUE(encrypt(R"({"scope":"abc"})"));
  });
  EXPECT_THAT(log_.lines(), ElementsAre("3 oauth_db_basic.cpp ==> ParamEncrypt[client_id]",
                                        "3 oauth_db_basic.cpp Data Encrypt failed",
                                        "3 oauth_db_basic.cpp ==> ParamDecrypt[client_secret]",
                                        "3 oauth_db_basic.cpp Data Decrypt failed"));
}

TEST_F(EncryptionTest, IsSilentWithoutReports) {
  withDiagnostics(14, [&] {
    EXPECT_TRUE(encrypt(R"({"client_id":"abc","client_secret":"xyz"})"));
    EXPECT_TRUE(decrypt(R"({"client_id":"sealed:cba","client_secret":"sealed:zyx"})"));
  });
  EXPECT_THAT(log_.lines(), IsEmpty());
}

// --- A table ---

// Two rows of a table t(id, client_id, client_secret, scope): the clients "abc" and "def" with
// the secrets "xyz" and "uvw".
class EncryptedTableTest : public StoreTest {
 protected:
  EncryptedTableTest() {
    execute(
        "CREATE TABLE t(id integer PRIMARY KEY, client_id text NOT NULL UNIQUE, "
        "client_secret text NOT NULL, scope text NOT NULL DEFAULT '')");
    store_.SetTabName("t");
    add("abc", "xyz");
    add("def", "uvw");
  }
  void add(const std::string& id, const std::string& secret) {
    Json::Value record;
    record["client_id"] = id;
    record["client_secret"] = secret;
    EXPECT_TRUE(store_.DBAdd(record));
  }
  // The rows read, identifier and secret of each: "abc/xyz"
  std::vector<std::string> read(const std::string& request) {
    Json::Value sent = parse(request), rows;
    EXPECT_TRUE(store_.DBGet(sent, &rows)) << request;
    std::vector<std::string> found;
    for (const Json::Value& row : rows)
      found.push_back(row["client_id"].asString() + "/" + row["client_secret"].asString());
    return found;
  }
  std::vector<std::string> stored() const {
    return query("SELECT client_id || '/' || client_secret FROM t ORDER BY id");
  }
  void expectNoError() const {
    EXPECT_EQ(255, store_.GetErrCode());
    EXPECT_EQ("", store_.GetErrMsg());
  }

  OAUTHDBBasic store_;
};

TEST_F(EncryptedTableTest, HoldsNoPlainText) {
  EXPECT_THAT(stored(), ElementsAre("sealed:cba/sealed:zyx", "sealed:fed/sealed:wvu"));
}

TEST_F(EncryptedTableTest, ReadsBackPlain) {
  EXPECT_THAT(read("{}"), ElementsAre("abc/xyz", "def/uvw"));
  EXPECT_THAT(log_.lines(), IsEmpty());
}

TEST_F(EncryptedTableTest, ReadsBackEveryOtherColumnAsItIs) {
  execute("UPDATE t SET scope = 'sealed:a' WHERE id = 1");
  Json::Value request = parse(R"({"condition": {"id": 1}})"), rows;
  EXPECT_TRUE(store_.DBGet(request, &rows));
  EXPECT_EQ(R"([{"client_id":"abc","client_secret":"xyz","id":"1","scope":"sealed:a"}])",
            text(rows));
}

TEST_F(EncryptedTableTest, IsSearchedByPlainText) {
  EXPECT_THAT(read(R"({"condition": {"client_id": "def"}})"), ElementsAre("def/uvw"));
  EXPECT_THAT(read(R"({"condition": {"client_secret": "xyz"}})"), ElementsAre("abc/xyz"));
  EXPECT_THAT(read(R"({"condition": {"client_id": "sealed:fed"}})"), IsEmpty());
}

TEST_F(EncryptedTableTest, MatchesPatternsAgainstTheEncryptedText) {
  EXPECT_THAT(read(R"({"condition_like": "client_id like '%abc%'"})"), IsEmpty());
  EXPECT_THAT(read(R"({"condition_like": "client_id='abc'"})"), IsEmpty());
  EXPECT_THAT(read(R"({"condition_like": "client_id like '%cba%'"})"), ElementsAre("abc/xyz"));
}

TEST_F(EncryptedTableTest, IsEditedByPlainText) {
  Json::Value request =
      parse(R"({"condition": {"client_id": "abc"}, "modified": {"client_secret": "it's new"}})");
  EXPECT_TRUE(store_.DBEdit(request));
  EXPECT_THAT(stored(), ElementsAre("sealed:cba/sealed:wen s'ti", "sealed:fed/sealed:wvu"));
  EXPECT_THAT(read("{}"), ElementsAre("abc/it's new", "def/uvw"));
}

TEST_F(EncryptedTableTest, EncryptsTheConditionOfAnEditFirst) {
  const std::size_t before = host_.calls().size();
  Json::Value request =
      parse(R"({"modified": {"client_id": "new"}, "condition": {"client_id": "abc"}})");
  EXPECT_TRUE(store_.DBEdit(request));
  ASSERT_EQ(before + 2, host_.calls().size());
  EXPECT_EQ("encrypt abc 1024", host_.calls()[before]);
  EXPECT_EQ("encrypt new 1024", host_.calls()[before + 1]);
}

TEST_F(EncryptedTableTest, IsDeletedFromByPlainText) {
  Json::Value request = parse(R"({"condition": {"client_id": "abc"}})");
  EXPECT_TRUE(store_.DBDel(request));
  EXPECT_THAT(stored(), ElementsAre("sealed:fed/sealed:wvu"));
}

TEST_F(EncryptedTableTest, KnowsASecondClientOfTheSameIdentifier) {
  Json::Value record = parse(R"({"client_id": "abc", "client_secret": "other"})");
  EXPECT_FALSE(store_.DBAdd(record));
  EXPECT_EQ(19, store_.GetErrCode());
  EXPECT_EQ("UNIQUE constraint failed: t.client_id", store_.GetErrMsg());
  EXPECT_THAT(log_.lines(), ElementsAre("3 oauth_db_basic.cpp Run Command failed!!"
                                        "[UNIQUE constraint failed: t.client_id][19]",
                                        "3 oauth_db_basic.cpp Add failed[t]"));
  EXPECT_THAT(stored(), ElementsAre("sealed:cba/sealed:zyx", "sealed:fed/sealed:wvu"));
}

// One row that cannot be decrypted must not hide the others.
class DamagedTableTest : public EncryptedTableTest {
 protected:
  // Damages the first row.
  void damage(const std::string& change) const {
    execute("UPDATE t SET " + change + " WHERE id = 1");
  }
};

TEST_F(DamagedTableTest, DeliversARowWithADamagedIdentifierAsStored) {
  damage("client_id = 'damaged'");
  EXPECT_THAT(read("{}"), ElementsAre("damaged/sealed:zyx", "def/uvw"));
  EXPECT_THAT(log_.lines(), ElementsAre("3 oauth_db_basic.cpp Data Decrypt failed",
                                        "3 oauth_db_basic.cpp Decrypt data failed"));
  EXPECT_THAT(log_.formats(),
              ElementsAre("%s:%d Data Decrypt failed", "%s:%d Decrypt data failed"));
  expectNoError();
}

TEST_F(DamagedTableTest, DeliversARowWithADamagedSecretHalfPlain) {
  damage("client_secret = ''");
  EXPECT_THAT(read("{}"), ElementsAre("abc/", "def/uvw"));
  EXPECT_THAT(log_.lines(), ElementsAre("3 oauth_db_basic.cpp Data Decrypt failed",
                                        "3 oauth_db_basic.cpp Decrypt data failed"));
  expectNoError();
}

TEST_F(DamagedTableTest, TracesTheRowToItsFailure) {
  damage("client_id = 'damaged'");
  withDiagnostics(15, [&] { read(R"({"condition": {"client_secret": "xyz"}})"); });
  EXPECT_THAT(
      log_.lines(),
      ElementsAre(
          "3 oauth_db_basic.cpp ==> DBGet", "3 oauth_db_basic.cpp ==> ParamEncrypt[client_secret]",
          "3 oauth_db_basic.cpp ==> GetConditionParam", "3 oauth_db_basic.cpp ==> ConcateParam",
          "3 oauth_db_basic.cpp ==> DBCmd",
          "3 oauth_db_basic.cpp ==> DBCmdRun[SELECT * FROM t WHERE client_secret='sealed:zyx' ;]",
          "3 oauth_db_basic.cpp ==> TabGetCallback", "3 oauth_db_basic.cpp ##### [0][id = 1]",
          "3 oauth_db_basic.cpp ##### [1][client_id = damaged]",
          "3 oauth_db_basic.cpp ##### [2][client_secret = sealed:zyx]",
          "3 oauth_db_basic.cpp ##### [3][scope = ]",
          "3 oauth_db_basic.cpp ==> ParamDecrypt[client_id]",
          "3 oauth_db_basic.cpp Data Decrypt failed", "3 oauth_db_basic.cpp Decrypt data failed",
          "3 oauth_db_basic.cpp ClientInfo Get Done"));
}

// --- The stores ---

class EncryptedStoreTest : public StoreTest {
 protected:
  // 64 bytes, as the stores want them.
  const std::string id_ = "client" + times(58, '1');
  const std::string secret_ = "secret" + times(58, '2');
  const std::string code_ = times(64, 'c');
  Json::Value result_, rows_;
};

TEST_F(EncryptedStoreTest, EncryptsBothMembersOfAClient) {
  OAUTHDBClientInfo store("oauth_clientInfo");
  EXPECT_TRUE(store.Add(id_, secret_, "uri", "scope", "name", "1", result_));
  EXPECT_THAT(query("SELECT * FROM oauth_clientInfo"),
              ElementsAre("1|" + FakeHost::sealed(id_) + "|" + FakeHost::sealed(secret_) +
                          "|uri|scope|name|1"));
  EXPECT_TRUE(store.Get(id_, &rows_));
  ASSERT_EQ(1U, rows_.size());
  EXPECT_EQ(id_, rows_[0U]["client_id"].asString());
  EXPECT_EQ(secret_, rows_[0U]["client_secret"].asString());
}

TEST_F(EncryptedStoreTest, EncryptsTheClientOfAToken) {
  OAUTHDBToken store("oauth_token");
  EXPECT_TRUE(store.Add("alice", id_, "read", code_, code_, "9", "code", "state", "", result_));
  EXPECT_THAT(query("SELECT client_id, access_token FROM oauth_token"),
              ElementsAre(FakeHost::sealed(id_) + "|" + code_));
  EXPECT_TRUE(store.GetWithAccessToken(code_, &rows_));
  ASSERT_EQ(1U, rows_.size());
  EXPECT_EQ(id_, rows_[0U]["client_id"].asString());
}

TEST_F(EncryptedStoreTest, EncryptsTheClientOfACode) {
  OAUTHDBGrantCode store("oauth_grantCode");
  EXPECT_TRUE(store.Add("alice", id_, "read", code_, "9", "state", "", result_));
  EXPECT_THAT(query("SELECT client_id, code FROM oauth_grantCode"),
              ElementsAre(FakeHost::sealed(id_) + "|" + code_));
  EXPECT_TRUE(store.Get(code_, &rows_));
  ASSERT_EQ(1U, rows_.size());
  EXPECT_EQ(id_, rows_[0U]["client_id"].asString());
}

TEST_F(EncryptedStoreTest, LeavesNoPlainTextInTheFile) {
  {
    OAUTHDBClientInfo store("oauth_clientInfo");
    EXPECT_TRUE(store.Add(id_, secret_, "uri", "scope", "findable", "1", result_));
  }
  const std::string bytes = databaseBytes();
  EXPECT_NE(std::string::npos, bytes.find("findable"));
  EXPECT_EQ(std::string::npos, bytes.find(id_));
  EXPECT_EQ(std::string::npos, bytes.find(secret_));
}

}  // namespace
