#include <gmock/gmock.h>
#include <gtest/gtest.h>

#include <cstdlib>

#include "host_libraries.h"

using testing::Each;

namespace {

class ZevocgiTest : public testing::Test {
 protected:
  ~ZevocgiTest() override { unsetenv("REMOTE_ADDR"); }

  int call(int size) {
    out_.assign(64, '#');
    return ZevoCgiGetRemoteIP(out_.data(), size);
  }

  std::string out_;
};

TEST_F(ZevocgiTest, TakesTheAddressOfTheRequest) {
  setenv("REMOTE_ADDR", "2001:db8::7", 1);
  EXPECT_EQ(0, call(64));
  EXPECT_STREQ("2001:db8::7", out_.c_str());
}

TEST_F(ZevocgiTest, RefusesOutsideARequest) {
  unsetenv("REMOTE_ADDR");
  EXPECT_NE(0, call(64));
  EXPECT_THAT(out_, Each('#'));
}

TEST_F(ZevocgiTest, TakesAnEmptyAddressForNone) {
  setenv("REMOTE_ADDR", "", 1);
  EXPECT_NE(0, call(64));
  EXPECT_THAT(out_, Each('#'));
}

TEST_F(ZevocgiTest, RefusesAnAddressThatDoesNotFit) {
  setenv("REMOTE_ADDR", "192.0.2.7", 1);
  for (const int size : {9, 1, 0, -1}) {
    EXPECT_NE(0, call(size)) << size;
    EXPECT_THAT(out_, Each('#')) << size;
  }
  EXPECT_EQ(0, call(10));
  EXPECT_STREQ("192.0.2.7", out_.c_str());
  EXPECT_THAT(out_.substr(10), Each('#'));
}

}  // namespace
