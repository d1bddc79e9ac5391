#include "terminal/human_time.h"

#include <gtest/gtest.h>

#include <limits>

using namespace oauthctl;

namespace {

constexpr std::int64_t kNow = 1'700'000'000, kLast = std::numeric_limits<std::int64_t>::max(),
                       kFirst = std::numeric_limits<std::int64_t>::min();

struct Moment {
  std::int64_t moment;
  const char* text;
};
void PrintTo(const Moment& moment, std::ostream* out) { *out << moment.text; }

class RelativeTimeTest : public testing::TestWithParam<Moment> {};

TEST_P(RelativeTimeTest, ChoosesTheUnit) {
  EXPECT_EQ(GetParam().text, relativeTime(GetParam().moment, kNow));
}

INSTANTIATE_TEST_SUITE_P(
    All, RelativeTimeTest,
    testing::Values(Moment{kNow, "now"}, Moment{kNow + 1, "in 1 s"}, Moment{kNow - 59, "59 s ago"},
                    Moment{kNow + 60, "in 1 min"}, Moment{kNow + 599, "in 9 min"},
                    Moment{kNow + 3600, "in 1 h"}, Moment{kNow - 7199, "119 min ago"},
                    Moment{kNow - 7200, "2 h ago"}, Moment{kNow - 86400, "1 day ago"},
                    Moment{kNow - 3 * 86400LL, "3 days ago"},
                    Moment{kNow + 800 * 86400LL, "in 2 years"},
                    Moment{kLast, "in 292471208623 years"},
                    Moment{kFirst, "292471208677 years ago"}));

struct Length {
  const char* text;
  std::int64_t seconds;  // -1: not a duration
};
void PrintTo(const Length& length, std::ostream* out) { *out << '"' << length.text << '"'; }

class DurationTest : public testing::TestWithParam<Length> {};

TEST_P(DurationTest, TakesANumberWithItsUnit) {
  EXPECT_EQ(GetParam().seconds, duration(GetParam().text).value_or(-1));
}

INSTANTIATE_TEST_SUITE_P(All, DurationTest,
                         testing::Values(Length{"0", 0}, Length{"90s", 90}, Length{"45m", 2700},
                                         Length{"12h", 43200}, Length{"30d", 2592000},
                                         Length{"2w", 1209600}, Length{"0d", 0}, Length{"30", -1},
                                         Length{"d", -1}, Length{"", -1}, Length{"-1d", -1},
                                         Length{"1.5h", -1}, Length{"1y", -1}, Length{" 1d", -1},
                                         Length{"99999999d", -1}));

TEST(LocalTimeTest, FallsBackToTheNumber) { EXPECT_EQ("9223372036854775807", localTime(kLast)); }

}  // namespace
