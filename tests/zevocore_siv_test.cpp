#include "zevocore_siv.h"

#include <gmock/gmock.h>
#include <gtest/gtest.h>

using testing::MatchesRegex;
using zevocore::Key;
using zevocore::seal;
using zevocore::unseal;

namespace {

Key countingKey(std::uint8_t first = 0) {
  Key key;
  for (std::uint8_t& byte : key) byte = first++;
  return key;
}

// Computed with another implementation of RFC 5297: associated data "" and "zevocore".
TEST(ZevocoreSivTest, AgreesWithAnotherImplementation) {
  EXPECT_EQ("DmsD82L4yIbnw4btlxrWSOMTcVjr", seal(countingKey(), "hello"));
  EXPECT_EQ(
      "fxrw-lrdxwgpriajw4dSBOSGg7NdUYh90wdOiJ2jmFByoH7sKxCNiRIO0Y1OISl1i4YT-DhmZZFWcGlyMXWefxk9"
      "uDctNfdUhix2JNUxiLk",
      seal(countingKey(), std::string(64, 'a')));
}

TEST(ZevocoreSivTest, GivesEqualTextsEqualResults) {
  EXPECT_EQ(seal(countingKey(), "client"), seal(countingKey(), "client"));
}

TEST(ZevocoreSivTest, ReturnsEveryPlainTextUnchanged) {
  for (const std::string plain : {"", "a", "it's", "\xC3\xA9t\xC3\xA9", "%_;--\n\t"}) {
    SCOPED_TRACE(plain);
    EXPECT_EQ(plain, unseal(countingKey(), seal(countingKey(), plain)));
  }
  for (std::size_t length = 0; length < 200; ++length) {
    const std::string plain(length, 'x');
    EXPECT_EQ(plain, unseal(countingKey(), seal(countingKey(), plain))) << length;
  }
}

TEST(ZevocoreSivTest, PrintsUrlSafeText) {
  for (std::size_t length = 0; length < 64; ++length)
    EXPECT_THAT(seal(countingKey(), std::string(length, 'x')), MatchesRegex("[-A-Za-z0-9_]+"));
}

TEST(ZevocoreSivTest, RefusesAChangeOfAnyCharacter) {
  const std::string sealed = seal(countingKey(), "a client's secret");
  for (std::size_t at = 0; at < sealed.size(); ++at)
    for (const char other : {'A', 'B', '-', '_', '=', '+', ' '}) {
      std::string changed = sealed;
      if (changed[at] == other) continue;
      changed[at] = other;
      EXPECT_EQ(std::nullopt, unseal(countingKey(), changed)) << changed;
    }
}

TEST(ZevocoreSivTest, RefusesAChangeOfLength) {
  const std::string sealed = seal(countingKey(), "a client's secret");
  for (std::size_t length = 0; length < sealed.size(); ++length)
    EXPECT_EQ(std::nullopt, unseal(countingKey(), sealed.substr(0, length))) << length;
  for (const std::string tail : {"A", "=", "==", "\n", "AAAA"})
    EXPECT_EQ(std::nullopt, unseal(countingKey(), sealed + tail)) << tail;
}

TEST(ZevocoreSivTest, RefusesTextSealedUnderAnotherKey) {
  EXPECT_EQ(std::nullopt, unseal(countingKey(1), seal(countingKey(0), "client")));
}

TEST(ZevocoreSivTest, RefusesPlainText) {
  for (const std::string text : {"", "client", "sealed:tneilc", "a b", "\xFF"})
    EXPECT_EQ(std::nullopt, unseal(countingKey(), text)) << text;
}

}  // namespace
