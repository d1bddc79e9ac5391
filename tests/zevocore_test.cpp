// The exported functions of the encryption stand-in, with a key that the test chooses.

#include <gmock/gmock.h>
#include <gtest/gtest.h>

#include "host_libraries.h"
#include "zevocore_key.h"
#include "zevocore_siv.h"

using testing::Each;
using testing::ElementsAre;

namespace {

std::optional<zevocore::Key> key;
std::vector<std::string> askedFor;

class ZevocoreTest : public testing::Test {
 protected:
  ZevocoreTest() {
    askedFor.clear();
    key.emplace();
    key->fill(7);
  }

  // Calls with a buffer of this size inside a larger one, and checks that nothing is written
  // outside it.
  template <class Function>
  int call(Function function, const std::string& text, int size) {
    out_.assign(2048, '#');
    const int result = function(text.c_str(), out_.data(), size);
    EXPECT_THAT(out_.substr(static_cast<std::size_t>(size)), Each('#'));
    return result;
  }
  std::string out() const { return out_.substr(0, out_.find('\0')); }

  std::string out_;
};

TEST_F(ZevocoreTest, ReturnsWhatItEncrypted) {
  EXPECT_EQ(1, call(ZOCLCryptSzEncrypt, "client", 1024));
  const std::string sealed = out();
  EXPECT_NE("client", sealed);
  EXPECT_EQ(1, call(ZOCLCryptSzDecrypt, sealed, 1024));
  EXPECT_EQ("client", out());
}

TEST_F(ZevocoreTest, KeepsItsKeyBesideTheDatabase) {
  call(ZOCLCryptSzEncrypt, "client", 1024);
  call(ZOCLCryptSzDecrypt, "client", 1024);
  EXPECT_THAT(askedFor,
              ElementsAre("/var/packages/Keyloft/target/etc", "/var/packages/Keyloft/target/etc"));
}

TEST_F(ZevocoreTest, RefusesWithoutAKey) {
  key.reset();
  EXPECT_EQ(0, call(ZOCLCryptSzEncrypt, "client", 1024));
  EXPECT_THAT(out_, Each('#'));
  EXPECT_EQ(0, call(ZOCLCryptSzDecrypt, "client", 1024));
  EXPECT_THAT(out_, Each('#'));
}

TEST_F(ZevocoreTest, RefusesTamperedText) {
  call(ZOCLCryptSzEncrypt, "client", 1024);
  std::string sealed = out();
  sealed[3] = sealed[3] == 'A' ? 'B' : 'A';
  EXPECT_EQ(0, call(ZOCLCryptSzDecrypt, sealed, 1024));
  EXPECT_THAT(out_, Each('#'));
}

TEST_F(ZevocoreTest, RefusesTextOfAnotherKey) {
  call(ZOCLCryptSzEncrypt, "client", 1024);
  const std::string sealed = out();
  key->fill(8);
  EXPECT_EQ(0, call(ZOCLCryptSzDecrypt, sealed, 1024));
}

TEST_F(ZevocoreTest, RefusesAResultThatDoesNotFit) {
  ASSERT_EQ(1, call(ZOCLCryptSzEncrypt, "client", 1024));
  const std::string sealed = out();
  const int length = static_cast<int>(sealed.size());
  EXPECT_EQ(1, call(ZOCLCryptSzEncrypt, "client", length + 1));
  for (const int size : {length, length - 1, 1, 0}) {
    EXPECT_EQ(0, call(ZOCLCryptSzEncrypt, "client", size)) << size;
    EXPECT_THAT(out_, Each('#')) << size;
  }
  EXPECT_EQ(1, call(ZOCLCryptSzDecrypt, sealed, 7));
  EXPECT_EQ(0, call(ZOCLCryptSzDecrypt, sealed, 6));
  EXPECT_THAT(out_, Each('#'));
}

// 751 bytes and the 16 of the tag print as 1023 characters.
TEST_F(ZevocoreTest, TakesTextsOf751BytesIntoABufferOf1024) {
  ASSERT_EQ(1, call(ZOCLCryptSzEncrypt, std::string(751, 'x'), 1024));
  EXPECT_EQ(1023U, out().size());
  EXPECT_EQ(1, call(ZOCLCryptSzDecrypt, out(), 1024));
  EXPECT_EQ(std::string(751, 'x'), out());
  EXPECT_EQ(0, call(ZOCLCryptSzEncrypt, std::string(752, 'x'), 1024));
}

TEST_F(ZevocoreTest, RefusesANegativeSize) {
  std::string untouched = "####";
  EXPECT_EQ(0, ZOCLCryptSzEncrypt("client", untouched.data(), -1));
  EXPECT_EQ("####", untouched);
}

}  // namespace

std::optional<zevocore::Key> zevocore::loadKey(const std::string& directory) {
  askedFor.push_back(directory);
  return key;
}
