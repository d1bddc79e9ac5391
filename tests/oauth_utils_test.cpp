#include "oauth_utils.h"

#include <sys/stat.h>
#include <sys/wait.h>
#include <unistd.h>

#include <climits>
#include <cstdlib>
#include <filesystem>
#include <fstream>
#include <future>
#include <iterator>
#include <set>
#include <sstream>
#include <utility>

#include "oauth_log.h"
#include "oauth_token.h"
#include "store_test.h"

using testing::ElementsAre;
using testing::ElementsAreArray;
using testing::IsEmpty;
using ZEVOOAUTHSERVER::OAUTHDBLog;
using ZEVOOAUTHSERVER::OAUTHDBToken;

namespace {

namespace ours = ZEVOOAUTHSERVER;
using Text = const std::string&;

// Compiles only if both spellings name a function of the same type.
template <class Function>
constexpr bool same(Function* plain, Function* qualified) {
  return plain == qualified;
}
static_assert(same<bool()>(::isDebugEnabled, ours::isDebugEnabled));
static_assert(same<int()>(::getLogLevel, ours::getLogLevel));
static_assert(same<int(Text)>(::getExpiredPeriod, ours::getExpiredPeriod));
static_assert(same<int(Text)>(::getTableRowMax, ours::getTableRowMax));
static_assert(same<bool(Text, int, int, bool)>(::checkStrLen, ours::checkStrLen));
static_assert(same<std::string()>(::getRemoteIP, ours::getRemoteIP));
static_assert(same<std::string(Text)>(::getSQLFormatStr, ours::getSQLFormatStr));
static_assert(same<std::string(Text, Text)>(::getSQLFormatLikeStr, ours::getSQLFormatLikeStr));
static_assert(same<std::string(unsigned)>(::getRandomStr, ours::getRandomStr));

constexpr const char* kPeriods[] = {"grantcode_expired", "token_expired"};
constexpr const char* kRowMaxima[] = {"client_info_max", "grantcode_max", "token_max", "log_max"};

// The given JSON text under each of the seven keys.
std::string everySetting(const std::string& value) {
  std::string text = R"({"log_level": )" + value;
  for (const char* const key : kPeriods) text += std::string(R"(, ")") + key + R"(": )" + value;
  for (const char* const key : kRowMaxima) text += std::string(R"(, ")") + key + R"(": )" + value;
  return text + "}";
}

std::vector<std::string> words(const std::string& text) {
  std::istringstream in(text);
  return {std::istream_iterator<std::string>(in), {}};
}

class SettingsTest : public StoreTest {
 protected:
  static int levelOnFreshThread() {
    int level = 0;
    onFreshThread([&] { level = getLogLevel(); });
    return level;
  }
  static bool debugOnFreshThread() {
    bool on = false;
    onFreshThread([&] { on = isDebugEnabled(); });
    return on;
  }
  void expectEverySetting(int period, int rowMax, int level) const {
    for (const char* const key : kPeriods) EXPECT_EQ(period, getExpiredPeriod(key)) << key;
    for (const char* const key : kRowMaxima) EXPECT_EQ(rowMax, getTableRowMax(key)) << key;
    EXPECT_EQ(level, levelOnFreshThread());
    EXPECT_THAT(log_.lines(), IsEmpty());
  }
  void expectDefaults() const { expectEverySetting(600, 1000, 0); }
  // Removes all permissions. False if this user can still read the file, as root can.
  static bool lock(const std::string& path) {
    std::filesystem::permissions(path, std::filesystem::perms::none);
    return !std::ifstream(path).is_open();
  }
};

// --- Settings file ---

TEST_F(SettingsTest, FallsBackToDefaultsWithoutAFile) {
  expectDefaults();
  std::filesystem::create_symlink(files_.directory() + "/nowhere", files_.settings());
  expectDefaults();
}

TEST_F(SettingsTest, FallsBackToDefaultsOnADirectory) {
  std::filesystem::create_directory(files_.settings());
  expectDefaults();
}

// Opening a pipe for reading waits for a writer, and a device may never end.
TEST_F(SettingsTest, FallsBackToDefaultsOnAPipe) {
  ASSERT_EQ(0, mkfifo(files_.settings().c_str(), 0600));
  expectDefaults();
}

TEST_F(SettingsTest, FallsBackToDefaultsOnADevice) {
  std::filesystem::create_symlink("/dev/zero", files_.settings());
  expectDefaults();
}

TEST_F(SettingsTest, ReadsAMebibyteAtMost) {
  constexpr std::size_t kLargest = 1048576;
  const std::string text = everySetting("7");
  writeSettings(text + times(static_cast<int>(kLargest - text.size()), ' '));
  expectEverySetting(7, 7, 7);
  writeSettings(text + times(static_cast<int>(kLargest + 1 - text.size()), ' '));
  expectDefaults();
}

TEST_F(SettingsTest, FollowsALinkToAFile) {
  writeSettings(everySetting("7"));
  std::filesystem::rename(files_.settings(), files_.directory() + "/elsewhere");
  std::filesystem::create_symlink("elsewhere", files_.settings());
  expectEverySetting(7, 7, 7);
}

TEST_F(SettingsTest, FallsBackToDefaultsOnAnUnreadableFile) {
  writeSettings(everySetting("7"));
  if (!lock(files_.settings())) GTEST_SKIP() << "this user may read every file";
  expectDefaults();
}

// Most contain a good setting inside something else. It must not be found there.
std::vector<std::string> badFiles() {
  const std::string good = everySetting("7");
  const std::string open = times(10000, '['), closed = times(10000, ']');
  std::string nested;
  for (int i = 0; i < 10000; ++i) nested += R"({"token_expired":)";
  std::vector<std::string> files =
      words(R"({ {} [] [7] null true 7 7.5 "token_expired" ["token_expired"] token_expired=7)"
            R"( {token_expired:7} {'token_expired':7})");
  files.push_back(good.substr(0, good.size() - 1));
  files.push_back(good.substr(0, good.size() - 1) + ",}");
  files.push_back(good.substr(0, good.size() / 2));
  files.push_back(good.substr(1));
  files.push_back("[" + good + "]");
  files.push_back("/* " + good);
  files.push_back("// " + good);
  files.push_back(std::string(1, '\0') + good);
  files.emplace_back("\x01\x02\xff");
  files.insert(files.end(), {"", " \n\t", open, open + closed, nested});
  files.push_back(R"({"deep": )" + open + closed + ", " + good.substr(1));
  return files;
}

TEST_F(SettingsTest, FallsBackToDefaultsOnABadFile) {
  for (const std::string& text : badFiles()) {
    SCOPED_TRACE(text.substr(0, 60) + "... of " + std::to_string(text.size()) + " bytes");
    writeSettings(text);
    expectDefaults();
  }
}

TEST_F(SettingsTest, FallsBackToDefaultsOnAnythingButA32BitInteger) {
  for (const std::string& value :
       words(R"("3600" "" 3600.5 0.5 1e10 -1e10 true false null {} {"token_expired":7} [] [7])"
             " 2147483648 -2147483649 4294967297 -4294967295 9223372036854775807"
             " -9223372036854775808 9223372036854775808 18446744073709551617"
             " 99999999999999999999999999")) {
    SCOPED_TRACE(value);
    writeSettings(everySetting(value));
    expectDefaults();
  }
}

TEST_F(SettingsTest, ClampsEverySettingByItsOwnRule) {
  struct Row {
    int value, period, rowMax;
  };
  static constexpr Row kRows[] = {{INT_MIN, 600, 1000},
                                  {-5, 600, 1000},
                                  {-1, 600, 1000},
                                  {0, 600, 1000},
                                  {1, 1, 1},
                                  {2, 2, 2},
                                  {600, 600, 600},
                                  {3600, 3600, 3600},
                                  {9999, 9999, 9999},
                                  {10000, 10000, 10000},
                                  {10001, 10001, 10000},
                                  {INT_MAX, INT_MAX, 10000}};
  for (const auto& row : kRows) {
    SCOPED_TRACE(row.value);
    writeSettings(everySetting(std::to_string(row.value)));
    expectEverySetting(row.period, row.rowMax, row.value);
  }
}

TEST_F(SettingsTest, AsksTheJsonLibraryWhetherAWholeRealIsAnInteger) {
  writeSettings(everySetting("3600.0"));
  if (Json::Value(3600.0).isInt())
    expectEverySetting(3600, 3600, 3600);
  else
    expectDefaults();
}

TEST_F(SettingsTest, ReadsEveryKeyByItsOwnName) {
  writeSettings(R"({"grantcode_expired": 1, "token_expired": 2, "client_info_max": 3,
                    "grantcode_max": 4, "token_max": 5, "log_max": 6, "log_level": 7})");
  EXPECT_EQ(1, getExpiredPeriod("grantcode_expired"));
  EXPECT_EQ(2, getExpiredPeriod("token_expired"));
  EXPECT_EQ(3, getTableRowMax("client_info_max"));
  EXPECT_EQ(4, getTableRowMax("grantcode_max"));
  EXPECT_EQ(5, getTableRowMax("token_max"));
  EXPECT_EQ(6, getTableRowMax("log_max"));
  EXPECT_EQ(7, levelOnFreshThread());
}

TEST_F(SettingsTest, ReadsAKeyThatNamesNoSettingAsAbsent) {
  writeSettings(everySetting("7"));
  for (const char* const key : {"", " ", "unknown", "token", "Token_expired", "token_expired "}) {
    EXPECT_EQ(600, getExpiredPeriod(key)) << key;
    EXPECT_EQ(1000, getTableRowMax(key)) << key;
  }
  EXPECT_THAT(log_.lines(), IsEmpty());
}

TEST_F(SettingsTest, KeepsGoodValuesBesideABadOne) {
  writeSettings(R"({"token_expired": "3600", "grantcode_expired": 30, "log_max": 7})");
  EXPECT_EQ(600, getExpiredPeriod("token_expired"));
  EXPECT_EQ(30, getExpiredPeriod("grantcode_expired"));
  EXPECT_EQ(7, getTableRowMax("log_max"));
  EXPECT_EQ(1000, getTableRowMax("token_max"));
}

TEST_F(SettingsTest, AllowsComments) {
  writeSettings("/* lifetimes */ {\"token_expired\": 3600, // seconds\n \"log_max\": 7}");
  EXPECT_EQ(3600, getExpiredPeriod("token_expired"));
  EXPECT_EQ(7, getTableRowMax("log_max"));
}

TEST_F(SettingsTest, SkipsAByteOrderMark) {
  writeSettings("\xEF\xBB\xBF{\"token_expired\": 3600}");
  EXPECT_EQ(3600, getExpiredPeriod("token_expired"));
}

TEST_F(SettingsTest, ReadsALongFileToItsEnd) {
  for (const int length : {4000, 4095, 4096, 4097, 1000000}) {
    writeSettings(R"({"note": ")" + times(length) + R"(", "token_expired": 3600})");
    EXPECT_EQ(3600, getExpiredPeriod("token_expired")) << length;
  }
}

TEST_F(SettingsTest, ReadsTheFileAfreshOnEveryCall) {
  for (const int value : {30, 7, 45}) {
    writeSettings(everySetting(std::to_string(value)));
    EXPECT_EQ(value, getExpiredPeriod("token_expired"));
    EXPECT_EQ(value, getTableRowMax("token_max"));
  }
  std::filesystem::remove(files_.settings());
  EXPECT_EQ(600, getExpiredPeriod("token_expired"));
  EXPECT_EQ(1000, getTableRowMax("token_max"));
}

TEST_F(SettingsTest, LeavesNoFileOpen) {
  const auto openFiles = [] {
    const std::filesystem::directory_iterator files("/proc/self/fd");
    return std::distance(begin(files), end(files));
  };
  const auto before = openFiles();
  for (const std::string& text : badFiles()) {
    writeSettings(text);
    getExpiredPeriod("token_expired");
  }
  writeSettings(everySetting("7"));
  getExpiredPeriod("token_expired");
  EXPECT_EQ(before, openFiles());
}

TEST_F(SettingsTest, OnlyTheLengthCheckHasDiagnostics) {
  withDiagnostics(15, [] {
    EXPECT_TRUE(isDebugEnabled());
    EXPECT_EQ(15, getLogLevel());
    EXPECT_EQ(600, getExpiredPeriod("token_expired"));
    EXPECT_EQ(1000, getTableRowMax("token_max"));
    EXPECT_EQ("it''s", getSQLFormatStr("it's"));
    EXPECT_EQ("msg like '%a%'", getSQLFormatLikeStr("msg", "a"));
    EXPECT_EQ("", getRemoteIP());
    EXPECT_EQ(64U, getRandomStr(64).size());
  });
  EXPECT_THAT(log_.lines(), IsEmpty());
}

// --- Diagnostic switch and level ---

TEST_F(SettingsTest, SwitchStaysOffOnAThreadThatAskedTooEarly) {
  onFreshThread([this] {
    EXPECT_FALSE(isDebugEnabled());
    createDebugMarker();
    EXPECT_FALSE(isDebugEnabled());
    EXPECT_TRUE(debugOnFreshThread());
    EXPECT_FALSE(isDebugEnabled());
  });
}

TEST_F(SettingsTest, SwitchStaysOnAfterTheMarkerIsGone) {
  createDebugMarker();
  onFreshThread([this] {
    EXPECT_TRUE(isDebugEnabled());
    std::filesystem::remove(files_.debugMarker());
    EXPECT_TRUE(isDebugEnabled());
    EXPECT_FALSE(debugOnFreshThread());
    EXPECT_TRUE(isDebugEnabled());
  });
}

TEST_F(SettingsTest, SwitchIsOffForALinkToNowhere) {
  std::filesystem::create_symlink(files_.directory() + "/nowhere", files_.debugMarker());
  EXPECT_FALSE(debugOnFreshThread());
  EXPECT_THAT(log_.lines(), IsEmpty());
}

TEST_F(SettingsTest, SwitchIsOffForAnUnreadableMarker) {
  createDebugMarker();
  if (!lock(files_.debugMarker())) GTEST_SKIP() << "this user may read every file";
  EXPECT_FALSE(debugOnFreshThread());
  EXPECT_THAT(log_.lines(), IsEmpty());
}

TEST_F(SettingsTest, SwitchAsksOnlyForReadability) {
  std::filesystem::create_directory(files_.debugMarker());
  EXPECT_TRUE(debugOnFreshThread());
}

TEST_F(SettingsTest, LevelStaysAsFirstReadOnItsThread) {
  for (const char* const first : {"0", "4", "-8", "\"four\""}) {
    SCOPED_TRACE(first);
    writeSettings(everySetting(first));
    onFreshThread([this] {
      const int before = getLogLevel();
      writeSettings(everySetting("9"));
      EXPECT_EQ(before, getLogLevel());
      EXPECT_EQ(9, levelOnFreshThread());
      std::filesystem::remove(files_.settings());
      EXPECT_EQ(before, getLogLevel());
      EXPECT_EQ(0, levelOnFreshThread());
    });
  }
}

TEST_F(SettingsTest, LevelMinusOneIsReadAgainEveryTime) {
  writeSettings(everySetting("-1"));
  onFreshThread([this] {
    EXPECT_EQ(-1, getLogLevel());
    writeSettings(everySetting("3"));
    EXPECT_EQ(3, getLogLevel());
    writeSettings(everySetting("5"));
    EXPECT_EQ(3, getLogLevel());
  });
}

TEST_F(SettingsTest, LevelIsNotReadWhileTheSwitchIsOff) {
  writeSettings(everySetting("4"));
  onFreshThread([this] {
    checkStrLen("abc", 1, 3, false);
    writeSettings(everySetting("9"));
    EXPECT_EQ(9, getLogLevel());
  });
}

// --- Logging rule ---

class DiagnosticsTest : public StoreTest {
 protected:
  DiagnosticsTest() { execute("INSERT INTO oauth_log VALUES(5, 'hi', 1)"); }
  // Logs lines of all four classes.
  void checkThenRead() {
    Json::Value rows;
    checkStrLen("abc", 1, 3, false);
    EXPECT_TRUE(store_.Get("", "", &rows));
  }
  OAUTHDBLog store_{"oauth_log"};
};

TEST_F(DiagnosticsTest, MaskBitsSelectTheirClasses) {
  static constexpr std::pair<int, const char*> kEverything[] = {
      {4, "3 oauth_utils.cpp checkStrLen[abc]"},
      {8, "3 oauth_log.cpp ==> Get"},
      {8, "3 oauth_db_basic.cpp ==> DBGet"},
      {8, "3 oauth_db_basic.cpp ==> GetConditionParam"},
      {8, "3 oauth_db_basic.cpp ==> DBCmd"},
      {8, "3 oauth_db_basic.cpp ==> DBCmdRun[SELECT * FROM oauth_log ;]"},
      {8, "3 oauth_db_basic.cpp ==> TabGetCallback"},
      {2, "3 oauth_db_basic.cpp ##### [0][timestamp = 5]"},
      {2, "3 oauth_db_basic.cpp ##### [1][msg = hi]"},
      {2, "3 oauth_db_basic.cpp ##### [2][id = 1]"},
      {1, "3 oauth_db_basic.cpp ClientInfo Get Done"}};
  for (int mask = -1; mask <= 16; ++mask) {
    SCOPED_TRACE(mask);
    std::vector<std::string> expected;
    for (const auto& [bit, line] : kEverything)
      if ((mask & bit) != 0) expected.emplace_back(line);
    log_.clear();
    withDiagnostics(mask, [this] { checkThenRead(); });
    EXPECT_THAT(log_.lines(), ElementsAreArray(expected));
  }
}

TEST_F(DiagnosticsTest, EveryMaskIsSilentWithoutTheMarker) {
  for (const int mask : {-1, 0, 1, 2, 4, 8, 9, 15, INT_MAX}) {
    writeSettings(everySetting(std::to_string(mask)));
    onFreshThread([this] { checkThenRead(); });
    EXPECT_THAT(log_.lines(), IsEmpty()) << mask;
  }
}

TEST_F(DiagnosticsTest, LateMarkerSwitchesOnNewThreadsOnly) {
  writeSettings(everySetting("4"));
  onFreshThread([this] {
    checkStrLen("first", 1, 9, false);
    createDebugMarker();
    checkStrLen("second", 1, 9, false);
    EXPECT_THAT(log_.lines(), IsEmpty());
    onFreshThread([] { checkStrLen("third", 1, 9, false); });
    checkStrLen("fourth", 1, 9, false);
  });
  EXPECT_THAT(log_.lines(), ElementsAre("3 oauth_utils.cpp checkStrLen[third]"));
}

TEST_F(DiagnosticsTest, FailuresStandBesideArgumentsAtLevelFour) {
  OAUTHDBToken tokens("oauth_token");
  withDiagnostics(4, [&] {
    Json::Value rows;
    EXPECT_FALSE(tokens.GetWithAccessToken("short", &rows));
  });
  EXPECT_EQ(-2, tokens.GetErrCode());
  EXPECT_EQ("Bad parameters", tokens.GetErrMsg());
  EXPECT_THAT(log_.lines(), ElementsAre("3 oauth_utils.cpp checkStrLen[short]",
                                        "3 oauth_token.cpp Bad parameters"));
}

// --- Length check ---

class CheckStrLenTest : public StoreTest {};

TEST_F(CheckStrLenTest, BothBoundsAreInclusive) {
  static const struct {
    int min, max;
    bool allowEmpty;
    std::vector<int> accepted, refused;
  } kRows[] = {{1, 10, false, {1, 2, 9, 10}, {0, 11}},
               {1, 10, true, {0, 1, 10}, {11}},
               {0, 10, false, {0, 1, 10}, {11}},
               {0, 10, true, {0, 1, 10}, {11}},
               {2, 10, true, {0, 2, 10}, {1, 11}},
               {3, 3, false, {3}, {0, 2, 4}},
               {1, 3, false, {1, 3}, {0, 4}},
               {64, 64, false, {64}, {0, 63, 65}},
               {64, 64, true, {0, 64}, {63, 65}},
               {1, 2048, false, {1, 2048}, {0, 2049}},
               {0, 0, false, {0}, {1}},
               {5, 3, true, {0}, {3, 4, 5}},
               {1, -1, true, {0}, {1}},
               {0, -1, false, {}, {0, 1}},
               {-5, 10, false, {0, 10}, {11}},
               {INT_MIN, INT_MAX, false, {0, 5000}, {}},
               {INT_MAX, INT_MAX, true, {0}, {1, 5000}},
               {INT_MIN, INT_MIN, false, {}, {0, 1}}};
  for (const auto& row : kRows) {
    SCOPED_TRACE(testing::Message() << row.min << ".." << row.max << ", empty " << row.allowEmpty);
    for (const int n : row.accepted)
      EXPECT_TRUE(checkStrLen(times(n), row.min, row.max, row.allowEmpty)) << n;
    for (const int n : row.refused)
      EXPECT_FALSE(checkStrLen(times(n), row.min, row.max, row.allowEmpty)) << n;
  }
  EXPECT_THAT(log_.lines(), IsEmpty());
}

TEST_F(CheckStrLenTest, CountsBytes) {
  const std::pair<std::string, int> rows[] = {
      {"\xc3\xa9", 2}, {"\xe2\x82\xac", 3}, {"\xf0\x9f\x94\x91", 4}, {"\xff", 1},
      {" a ", 3},      {"\r\n", 2},         {{'a', '\0', 'b'}, 3}};
  for (const auto& [text, bytes] : rows) {
    EXPECT_TRUE(checkStrLen(text, bytes, bytes, false)) << text;
    EXPECT_FALSE(checkStrLen(text, bytes + 1, 10, false)) << text;
    EXPECT_FALSE(checkStrLen(text, 0, bytes - 1, true)) << text;
  }
}

TEST_F(CheckStrLenTest, DumpsEveryArgumentAsItIs) {
  const std::string longText = times(5000);
  withDiagnostics(4, [&] {
    EXPECT_TRUE(checkStrLen("", 1, 3, true));
    EXPECT_FALSE(checkStrLen("too long", 1, 3, false));
    EXPECT_TRUE(checkStrLen("%s%n%d", 1, 9, false));
    EXPECT_TRUE(checkStrLen("it's \xc3\xa9", 1, 9, false));
    EXPECT_TRUE(checkStrLen(std::string("a\0b", 3), 3, 3, false));
    EXPECT_TRUE(checkStrLen(longText, 5000, 5000, false));
  });
  const std::string start = "3 oauth_utils.cpp checkStrLen[";
  EXPECT_THAT(log_.lines(),
              ElementsAre(start + "]", start + "too long]", start + "%s%n%d]",
                          start + "it's \xc3\xa9]", start + "a]", start + longText + "]"));
  EXPECT_EQ(std::vector<std::string>(6, "%s:%d %s[%s]"), log_.formats());
}

// --- SQL quoting ---

class SqlQuotingTest : public StoreTest {};

TEST_F(SqlQuotingTest, DoublesSingleQuotesOnly) {
  const std::pair<std::string, std::string> rows[] = {
      {"it's", "it''s"},
      {"'", "''"},
      {"''", "''''"},
      {"'a'b'", "''a''b''"},
      {"\\'", "\\''"},
      {"'; DROP TABLE oauth_log; --", "''; DROP TABLE oauth_log; --"},
      {"\xe2\x82\xac's \xff", "\xe2\x82\xac''s \xff"},
      {times(100000, '\''), times(200000, '\'')}};
  for (const auto& [value, formatted] : rows)
    EXPECT_EQ(formatted, getSQLFormatStr(value)) << value.substr(0, 60);
  EXPECT_THAT(log_.lines(), IsEmpty());
}

TEST_F(SqlQuotingTest, LeavesAValueWithoutAQuoteUnchanged) {
  for (const std::string& value :
       {std::string(), std::string("plain"), std::string(R"("a" `b` \ 50% a_b %s%n%q%d)"),
        std::string("\t\r\n\x01\xe2\x82\xac\xff"), times(1000000)})
    EXPECT_EQ(value, getSQLFormatStr(value)) << value.substr(0, 60);
  EXPECT_THAT(log_.lines(), IsEmpty());
}

TEST_F(SqlQuotingTest, ValueEndsAtItsFirstNulByte) {
  const std::string value("it's\0 or 'this'", 15);
  EXPECT_EQ("it''s", getSQLFormatStr(value));
  EXPECT_EQ("", getSQLFormatStr(std::string("\0'", 2)));
  EXPECT_EQ("msg like '%it''s%'", getSQLFormatLikeStr("msg", value));
}

TEST_F(SqlQuotingTest, DatabaseReadsTheValueBack) {
  for (const char* const value : {"it's", "'", "'; --", "\\'", "\xe2\x82\xac'%_"})
    EXPECT_THAT(query("SELECT '" + getSQLFormatStr(value) + "'"), ElementsAre(value));
}

TEST_F(SqlQuotingTest, LikeWrapsTheValueInPercentSigns) {
  static constexpr struct {
    const char *column, *value, *condition;
  } kRows[] = {{"scope", "O'Brien", "scope like '%O''Brien%'"},
               {"scope", "a_b", "scope like '%a_b%'"},
               {"msg", "", "msg like '%%'"},
               {"msg", "50%", "msg like '%50%%'"},
               {"msg", "%s%n%q", "msg like '%%s%n%q%'"},
               {"msg", "'' or 1=1 --", "msg like '%'''' or 1=1 --%'"},
               {"msg", "\xe2\x82\xac\\", "msg like '%\xe2\x82\xac\\%'"},
               {"it's", "a", "it's like '%a%'"},
               {"%q", "a", "%q like '%a%'"},
               {"", "a", " like '%a%'"}};
  for (const auto& row : kRows)
    EXPECT_EQ(row.condition, getSQLFormatLikeStr(row.column, row.value));
  EXPECT_EQ("msg like '%" + times(200000, '\'') + "%'",
            getSQLFormatLikeStr("msg", times(100000, '\'')));
  EXPECT_THAT(log_.lines(), IsEmpty());
}

TEST_F(SqlQuotingTest, LikeKeepsWildcardsAtWork) {
  execute("CREATE TABLE t(msg text)");
  execute("INSERT INTO t VALUES('ab'), ('a_b'), ('-axb-'), ('AXB'), ('O''Brien'), ('a%b')");
  const auto found = [this](const std::string& value) {
    return query("SELECT msg FROM t WHERE " + getSQLFormatLikeStr("msg", value) +
                 " ORDER BY rowid");
  };
  EXPECT_THAT(found("a_b"), ElementsAre("a_b", "-axb-", "AXB", "a%b"));
  EXPECT_THAT(found("a%b"), ElementsAre("ab", "a_b", "-axb-", "AXB", "a%b"));
  EXPECT_THAT(found("O'B"), ElementsAre("O'Brien"));
  EXPECT_THAT(found("' or 1=1 --"), IsEmpty());
}

TEST_F(SqlQuotingTest, OutOfMemoryGivesTheEmptyString) {
  files_.failFormatting();
  EXPECT_EQ("", getSQLFormatStr("value"));
  EXPECT_THAT(log_.lines(), ElementsAre("3 oauth_utils.cpp Can't transfer to SQL format"));
  EXPECT_THAT(log_.formats(), ElementsAre("%s:%d Can't transfer to SQL format"));
}

TEST_F(SqlQuotingTest, LikeOutOfMemoryGivesTheEmptyString) {
  files_.failFormatting();
  EXPECT_EQ("", getSQLFormatLikeStr("scope", "value"));
  EXPECT_THAT(log_.lines(), ElementsAre("3 oauth_utils.cpp Can't transfer to SQL format"));
  EXPECT_THAT(log_.formats(), ElementsAre("%s:%d Can't transfer to SQL format"));
}

// --- Web client's address ---

class RemoteIpTest : public StoreTest {};

TEST_F(RemoteIpTest, TellsTheAddressAsTheHostGaveIt) {
  for (const std::string& address :
       {std::string("192.0.2.7"), std::string("::1"), std::string("2001:db8::7"), std::string(),
        std::string(" no address'"), times(1023)}) {
    host_.setRemoteIp(address);
    EXPECT_EQ(address, getRemoteIP());
  }
  EXPECT_THAT(log_.lines(), IsEmpty());
}

TEST_F(RemoteIpTest, IsEmptyOutsideARequest) {
  EXPECT_EQ("", getRemoteIP());
  EXPECT_THAT(host_.calls(), ElementsAre("ip 1024"));
  EXPECT_THAT(log_.lines(), IsEmpty());
}

TEST_F(RemoteIpTest, IsEmptyWhenTheHostRefuses) {
  host_.setRemoteIp(times(1024));
  EXPECT_EQ("", getRemoteIP());
  EXPECT_THAT(host_.calls(), ElementsAre("ip 1024"));
  EXPECT_THAT(log_.lines(), IsEmpty());
}

TEST_F(RemoteIpTest, TakesEveryAnswerButZeroForARefusal) {
  for (const int code : {1, -1, 2, 1024}) {
    host_.setRemoteIp("192.0.2.7", code);
    EXPECT_EQ("", getRemoteIP()) << code;
  }
  EXPECT_THAT(log_.lines(), IsEmpty());
}

TEST_F(RemoteIpTest, StopsAtTheEndOfAnOverfilledBuffer) {
  host_.overfill();
  EXPECT_EQ(times(1024, 'x'), getRemoteIP());
  EXPECT_THAT(host_.calls(), ElementsAre("ip 1024"));
}

TEST_F(RemoteIpTest, IgnoresTheEnvironment) {
  setenv("REMOTE_ADDR", "192.0.2.7", 1);
  EXPECT_EQ("", getRemoteIP());
  unsetenv("REMOTE_ADDR");
}

// --- Random secrets ---

class RandomStrTest : public StoreTest {};

TEST_F(RandomStrTest, NeedsNoDevice) {
  files_.removeRandomDevice();
  const std::string text = getRandomStr(64);
  EXPECT_EQ(64U, text.size());
  EXPECT_NE(text, getRandomStr(64));
}

TEST_F(RandomStrTest, ComesFromTheDeviceWhereTheKernelHasNoCall) {
  for (const int error : {ENOSYS, EPERM}) {  // EPERM: a filter of system calls refuses it
    files_.failRandomCall(error);
    const std::string text = getRandomStr(64);
    EXPECT_EQ(64U, text.size());
    EXPECT_NE(text, getRandomStr(64));
  }
}

TEST_F(RandomStrTest, IsWholeWhenTheCallIsInterrupted) {
  files_.trickleRandomBytes();
  files_.removeRandomDevice();
  // Every byte is in its place, except for the digits of version and variant.
  EXPECT_EQ("0102030405064708890a0b0c0d0e0f101112131415164718991a1b1c1d1e1f20", getRandomStr(64));
  EXPECT_EQ(3200U, getRandomStr(3200).size());
}

TEST_F(RandomStrTest, IsEmptyWhenBothSourcesFail) {
  files_.failRandomCall(ENOSYS);
  files_.removeRandomDevice();
  for (const unsigned length : {0U, 1U, 32U, 64U}) EXPECT_EQ("", getRandomStr(length)) << length;
  EXPECT_THAT(log_.lines(), IsEmpty());
}

TEST_F(RandomStrTest, IsEmptyWhenTheSourcesFailHalfway) {
  files_.failRandomCall(ENOSYS, 1);
  files_.removeRandomDevice();
  EXPECT_EQ("", getRandomStr(64));
}

TEST_F(RandomStrTest, RoundsTheLengthUpToWholeBlocks) {
  static constexpr std::pair<unsigned, std::size_t> kRows[] = {
      {0, 0},   {1, 32},  {31, 32}, {32, 32}, {33, 64},     {40, 64},
      {63, 64}, {64, 64}, {65, 96}, {96, 96}, {1000, 1024}, {4097, 4128}};
  for (const auto& [asked, given] : kRows) EXPECT_EQ(given, getRandomStr(asked).size()) << asked;
}

// The 13th digit is the version and the 17th the variant. All others must vary.
TEST_F(RandomStrTest, EveryPositionOfABlockTakesAllItsDigits) {
  std::set<char> seen[32];
  const std::string text = getRandomStr(3000 * 32);
  for (std::size_t i = 0; i < text.size(); ++i) seen[i % 32].insert(text[i]);
  for (int i = 0; i < 32; ++i) {
    std::string expected = "0123456789abcdef";
    if (i == 12) expected = "4";
    if (i == 16) expected = "89ab";
    EXPECT_EQ(expected, std::string(seen[i].begin(), seen[i].end())) << "position " << i;
  }
}

TEST_F(RandomStrTest, NeverRepeatsABlockOnAnyThread) {
  const auto draw = [] {
    std::string text;
    for (int i = 0; i < 500; ++i) text += getRandomStr(64);
    return text;
  };
  std::vector<std::future<std::string>> draws(4);
  for (auto& drawn : draws) drawn = std::async(std::launch::async, draw);
  std::set<std::string> blocks;
  for (auto& drawn : draws) {
    const std::string text = drawn.get();
    for (std::size_t at = 0; at < text.size(); at += 32) blocks.insert(text.substr(at, 32));
  }
  EXPECT_EQ(4000U, blocks.size());
}

// A generator that is kept between calls would be copied by fork() and give both the same text.
TEST_F(RandomStrTest, ChildProcessesDrawDifferentTexts) {
  const auto drawInChild = [] {
    int ends[2] = {};
    EXPECT_EQ(0, pipe(ends));
    const pid_t child = fork();
    if (child == 0) {
      const std::string text = getRandomStr(64);
      _exit(write(ends[1], text.data(), text.size()) == 64 ? 0 : 1);
    }
    close(ends[1]);
    char text[64] = {};
    EXPECT_EQ(64, read(ends[0], text, sizeof text));
    close(ends[0]);
    int status = -1;
    EXPECT_EQ(child, waitpid(child, &status, 0));
    EXPECT_EQ(0, status);
    return std::string(text, sizeof text);
  };
  getRandomStr(32);
  const std::string first = drawInChild();
  EXPECT_NE(first, drawInChild());
}

}  // namespace
