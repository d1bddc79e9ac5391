// The table of settings, and the pages that repeat it for people.

#include "oauth_settings.h"

#include <gmock/gmock.h>

#include <fstream>
#include <iterator>
#include <limits>
#include <regex>
#include <sstream>
#include <string>
#include <tuple>
#include <vector>

using testing::AnyOf;
using testing::ElementsAreArray;
using testing::IsEmpty;
using testing::Not;

namespace ZEVOOAUTHSERVER {
namespace {

struct Row {
  std::string name, bounds, fallback, range;
};
bool operator==(const Row& a, const Row& b) {
  return a.name == b.name && a.bounds == b.bounds && a.fallback == b.fallback && a.range == b.range;
}
void PrintTo(const Row& row, std::ostream* out) {
  *out << "| `" << row.name << "` | " << row.bounds << " | " << row.fallback << " | " << row.range
       << " |";
}

std::string rangeText(const SettingRange& range) {
  if (range.smallest == std::numeric_limits<int>::min()) return "any integer";
  return std::to_string(range.smallest) + " to " + std::to_string(range.largest);
}

// The table in the order of the names.
std::vector<Row> table() {
  std::vector<Row> rows;
  for (const Setting& setting : kSettings)
    rows.push_back({setting.name, setting.bounds, std::to_string(setting.range.fallback),
                    rangeText(setting.range)});
  return rows;
}

std::string contentOf(const std::string& file) {
  std::ifstream input(std::string(PROJECT_FOLDER "/") + file);
  return {std::istreambuf_iterator<char>(input), {}};
}

// The rows below the heading that both pages have.
std::vector<Row> rowsOf(const std::string& page) {
  const std::regex row(R"(\| `([a-z_]+)` \| ([^|]*) \| ([^|]*) \| ([^|]*) \|)");
  std::istringstream lines(contentOf(page));
  std::vector<Row> rows;
  std::smatch cells;
  for (std::string line; std::getline(lines, line);)
    if (std::regex_match(line, cells, row))
      rows.push_back({cells[1], cells[2], cells[3], cells[4]});
  return rows;
}

TEST(SettingsTableTest, IsWholeInTheReference) {
  EXPECT_THAT(rowsOf("docs/reference/settings.md"), ElementsAreArray(table()));
}

TEST(SettingsTableTest, IsWholeInTheReadme) {
  EXPECT_THAT(rowsOf("README.md"), ElementsAreArray(table()));
}

// A setting that is not in the table is not shown to the operator.
TEST(SettingsTableTest, HasEveryNameOfTheVocabulary) {
  const std::string header = contentOf("src/oauth_names.h");
  const std::string start = "namespace setting {", end = "}  // namespace setting";
  const auto from = header.find(start), to = header.find(end);
  ASSERT_NE(std::string::npos, from);
  ASSERT_NE(std::string::npos, to);
  const std::string block = header.substr(from, to - from);
  const std::regex constant("\\] = \"([a-z_]+)\";");
  std::vector<std::string> inVocabulary, inTable;
  for (std::sregex_iterator match(block.begin(), block.end(), constant), none; match != none;
       ++match)
    inVocabulary.push_back((*match)[1]);
  for (const Setting& setting : kSettings) inTable.emplace_back(setting.name);
  EXPECT_THAT(inVocabulary, Not(IsEmpty()));
  EXPECT_THAT(inVocabulary, testing::UnorderedElementsAreArray(inTable))
      << "kSettings in src/utils/oauth_settings.h needs a row for each name in src/oauth_names.h";
}

// getTableRowMax(), getExpiredPeriod() and getLogLevel() have one range each and do not look into
// the table: with another range in its row, oauthctl would show values that the library does not
// use.
TEST(SettingsTableTest, HasOnlyTheRangesOfTheReadingFunctions) {
  const auto values = [](const SettingRange& range) {
    return std::make_tuple(range.fallback, range.smallest, range.largest);
  };
  for (const Setting& setting : kSettings)
    EXPECT_THAT(values(setting.range),
                AnyOf(values(kRowCeiling), values(kLifetime), values(kLevelMask)))
        << setting.name;
}

TEST(SettingsTableTest, ReplacesValuesOutsideTheRange) {
  for (const Setting& setting : kSettings) {
    SCOPED_TRACE(setting.name);
    const SettingRange& range = setting.range;
    EXPECT_EQ(range.fallback, range.inForce(range.fallback));
    EXPECT_EQ(range.smallest, range.inForce(range.smallest));
    EXPECT_EQ(range.largest, range.inForce(range.largest));
    if (range.smallest > std::numeric_limits<int>::min()) {
      EXPECT_EQ(range.fallback, range.inForce(range.smallest - 1));
    }
    if (range.largest < std::numeric_limits<int>::max()) {
      EXPECT_EQ(range.largest, range.inForce(range.largest + 1));
    }
  }
}

}  // namespace
}  // namespace ZEVOOAUTHSERVER
