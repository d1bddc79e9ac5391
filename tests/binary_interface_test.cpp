// The layout of the classes, which programs compiled earlier rely on: members in the order error
// code, ready flag, error message, table name, connection, on every architecture.

#include <gtest/gtest.h>
#include <sqlite3.h>

#include <cstring>
#include <type_traits>

#include "oauth_clientInfo.h"
#include "oauth_grantCode.h"
#include "oauth_log.h"
#include "oauth_token.h"
#include "store_test.h"

using namespace ZEVOOAUTHSERVER;

namespace {

struct Layout {
  int errCode;
  bool ready;
  std::string errMsg, tabName;
  sqlite3* db;
};

// In bytes: 80 where a pointer has 8, 60 where it has 4.
constexpr std::size_t kSize = sizeof(void*) == 8 ? 80 : 60;

template <class Store>
constexpr bool isBaseAlone =
    sizeof(Store) == kSize &&
    !std::is_polymorphic_v<Store> && std::is_base_of_v<OAUTHDBBasic, Store>;

TEST(BinaryInterfaceTest, GivesEveryClassTheSameSize) {
  EXPECT_EQ(kSize, sizeof(Layout));
  EXPECT_TRUE(isBaseAlone<OAUTHDBBasic>);
  EXPECT_TRUE(isBaseAlone<OAUTHDBClientInfo>);
  EXPECT_TRUE(isBaseAlone<OAUTHDBGrantCode>);
  EXPECT_TRUE(isBaseAlone<OAUTHDBToken>);
  EXPECT_TRUE(isBaseAlone<OAUTHDBLog>);
}

// No symbol stands for them: a changed value would not reach programs compiled earlier.
TEST(BinaryInterfaceTest, KeepsTheErrorCodesThatProgramsWereCompiledWith) {
  EXPECT_EQ(255, kErrNone);
  EXPECT_EQ(-1, kErrCreateTable);
  EXPECT_EQ(-2, kErrBadParameters);
  EXPECT_EQ(-3, kErrTokenExpired);
  EXPECT_EQ(-4, kErrCrypt);
  EXPECT_EQ(-5, kErrTableFull);
}

// A static member has the same symbol, but is called without an object.
template <class Result, class... Arguments>
using Member = Result (OAUTHDBBasic::*)(Arguments...);
template <class Expected, class Actual>
constexpr bool isCalledAs = std::is_same_v<Expected, Actual>;

TEST(BinaryInterfaceTest, CallsTheTranslationsOnAnObject) {
  using Value = const Json::Value&;
  using Base = OAUTHDBBasic;
  using Fragment = Member<std::string, Value>;
  EXPECT_TRUE((isCalledAs<Fragment, decltype(&Base::GetInsertParam)>));
  EXPECT_TRUE((isCalledAs<Fragment, decltype(&Base::GetConditionParam)>));
  EXPECT_TRUE((isCalledAs<Fragment, decltype(&Base::GetUpdateParam)>));
  EXPECT_TRUE(
      (isCalledAs<Member<std::string, Value, const std::string&>, decltype(&Base::ConcateParam)>));
  EXPECT_TRUE((isCalledAs<Member<bool, Json::Value&>, decltype(&Base::ParamEncrypt)>));
  EXPECT_TRUE((isCalledAs<Member<bool, Json::Value&>, decltype(&Base::ParamDecrypt)>));
}

TEST(BinaryInterfaceTest, CallsTheRowCallbacksWithoutAnObject) {
  EXPECT_TRUE((isCalledAs<OAUTHDBBasic::RowCallback, decltype(&OAUTHDBBasic::IsTabExistCallback)>));
  EXPECT_TRUE((isCalledAs<OAUTHDBBasic::RowCallback, decltype(&OAUTHDBBasic::TabCountCallback)>));
  EXPECT_TRUE((isCalledAs<OAUTHDBBasic::RowCallback, decltype(&OAUTHDBBasic::TabGetCallback)>));
}

class BinaryInterfaceMembersTest : public StoreTest {
 protected:
  static const Layout& layoutOf(const OAUTHDBBasic& store) {
    return reinterpret_cast<const Layout&>(store);
  }
};

TEST_F(BinaryInterfaceMembersTest, StandInTheirOrder) {
  OAUTHDBToken store("oauth_token");
  store.SetErrCode(0x12345678);
  store.SetErrMsg("a message too long for the place inside a string");
  const Layout& layout = layoutOf(store);
  EXPECT_EQ(0x12345678, layout.errCode);
  EXPECT_TRUE(layout.ready);
  EXPECT_EQ("a message too long for the place inside a string", layout.errMsg);
  EXPECT_EQ("oauth_token", layout.tabName);
  EXPECT_EQ(files_.database(), sqlite3_db_filename(layout.db, "main"));
}

TEST_F(BinaryInterfaceMembersTest, ShowAStoreThatIsNotReady) {
  files_.removeDirectory();
  const OAUTHDBToken store("oauth_token");
  EXPECT_FALSE(layoutOf(store).ready);
  EXPECT_EQ(-1, layoutOf(store).errCode);
}

}  // namespace
