// Help, mistakes, and the files made from the table of commands.

#include <sys/stat.h>

#include <set>
#include <sstream>

#include "command_line/command_table.h"
#include "command_line/documents.h"
#include "oauthctl_test.h"

using testing::HasSubstr;
using testing::Not;
using testing::StartsWith;

namespace {

Words wordsOf(const std::string& text) {
  std::istringstream stream(text);
  Words words;
  for (std::string word; stream >> word;) words.push_back(word);
  return words;
}

class UsageTest : public OauthctlTest {};

TEST_F(UsageTest, ExplainsEveryCommandWithAnExample) {
  for (const oauthctl::Command& command : oauthctl::commandTable()) {
    SCOPED_TRACE(command.path);
    Words words = wordsOf(command.path);
    words.emplace_back("--help");
    const Outcome outcome = run(words);
    EXPECT_EQ(0, outcome.code);
    EXPECT_EQ("", outcome.err);
    EXPECT_THAT(outcome.out, StartsWith(std::string("Usage: oauthctl ") + command.path));
    EXPECT_THAT(outcome.out, HasSubstr(std::string("\n") + command.summary + ".\n"));
    EXPECT_THAT(outcome.out, HasSubstr("\nExample"));
    ASSERT_FALSE(command.examples.empty());
    for (const oauthctl::Example& example : command.examples)
      EXPECT_THAT(outcome.out, HasSubstr(example.line));
    for (const oauthctl::Option& option : command.options)
      EXPECT_THAT(outcome.out, HasSubstr(option.help.empty() ? "no help" : option.name));
  }
}

TEST_F(UsageTest, ListsEveryCommandInTheHelpOfTheProgram) {
  const Outcome outcome = run({"--help"});
  EXPECT_EQ(0, outcome.code);
  EXPECT_EQ("", outcome.err);
  for (const oauthctl::Command& command : oauthctl::commandTable())
    EXPECT_THAT(outcome.out, HasSubstr(std::string("\n  ") + command.path + "  "));
}

TEST_F(UsageTest, ListsTheCommandsOfAGroup) {
  const Outcome outcome = run({"client", "-h"});
  EXPECT_EQ(0, outcome.code);
  EXPECT_THAT(outcome.out, StartsWith("Usage: oauthctl client COMMAND"));
  EXPECT_THAT(outcome.out, HasSubstr("\n  client delete   Delete a client\n"));
}

// A group without a row in commandGroups() has no summary, and bash does not complete its commands.
TEST_F(UsageTest, DescribesEveryGroup) {
  std::set<std::string> described;
  for (const oauthctl::Group& group : oauthctl::commandGroups()) described.insert(group.word);
  for (const oauthctl::Command& command : oauthctl::commandTable())
    if (wordsOf(command.path).size() == 1) described.insert(command.path);
  for (const oauthctl::Command& command : oauthctl::commandTable())
    EXPECT_EQ(1U, described.count(wordsOf(command.path)[0])) << "add its group: " << command.path;
}

TEST_F(UsageTest, TellsItsVersion) {
  EXPECT_EQ("oauthctl " OAUTHCTL_VERSION "\n", run({"--version"}).out);
}

// Every line of help fits a terminal of 80 columns, but for the examples: they can be copied whole.
TEST_F(UsageTest, KeepsHelpWithinEightyColumns) {
  for (const oauthctl::Command& command : oauthctl::commandTable()) {
    Words words = wordsOf(command.path);
    words.emplace_back("--help");
    std::istringstream help(run(words).out);
    for (std::string line; std::getline(help, line) && line.rfind("Example", 0) != 0;)
      EXPECT_GE(80U, line.size()) << line;
  }
}

struct Mistake {
  Words words;
  std::string complaint;
};
void PrintTo(const Mistake& mistake, std::ostream* out) {
  *out << testing::PrintToString(mistake.words);
}

class MistakeTest : public UsageTest, public testing::WithParamInterface<Mistake> {};

// A mistake is reported first: these tests have no database, and none is made.
TEST_P(MistakeTest, IsOneLine) {
  EXPECT_EQ(GetParam().complaint, complaint(run(GetParam().words)));
  struct stat status;
  EXPECT_NE(0, stat(files_.database().c_str(), &status));
}

const std::string kLong(65, 'n');

INSTANTIATE_TEST_SUITE_P(
    All, MistakeTest,
    testing::Values(
        Mistake{{}, "2 a command is missing (see 'oauthctl --help')"},
        Mistake{{"sttaus"},
                "2 The following argument was not expected: sttaus (see 'oauthctl --help')"},
        Mistake{{"client"}, "2 a command is missing (see 'oauthctl client --help')"},
        Mistake{{"status", "--jsno"},
                "2 The following argument was not expected: --jsno (see 'oauthctl status --help')"},
        Mistake{{"status", "bell\a\x1b[31m"},
                "2 The following argument was not expected: bell\\x07\\x1b[31m (see 'oauthctl "
                "status --help')"},
        Mistake{{"client", "show"}, "2 CLIENT is required (see 'oauthctl client show --help')"},
        Mistake{{"token", "list", "--user"},
                "2 --user: 1 required NAME missing (see 'oauthctl token list --help')"},
        Mistake{
            {"token", "revoke"},
            "2 give exactly one of --user, --client, --id (see 'oauthctl token revoke --help')"},
        Mistake{
            {"token", "revoke", "--user", "a", "--id", "1"},
            "2 give exactly one of --user, --client, --id (see 'oauthctl token revoke --help')"},
        Mistake{{"token", "show", "x"}, "2 'x' is no row number: give one from the list"},
        Mistake{{"token", "purge", "--grace", "30"},
                "2 '30' is no duration: give 90s, 45m, 12h, 30d, 2w or 0"},
        Mistake{{"token", "purge", "--grace", "-1d"},
                "2 '-1d' is no duration: give 90s, 45m, 12h, 30d, 2w or 0"},
        Mistake{{"log", "--last", "0"}, "2 '0' is no number of lines: give 1 or more"},
        Mistake{{"log", "--last", "many"}, "2 'many' is no number of lines: give 1 or more"},
        Mistake{{"client", "edit", "1"},
                "2 nothing to change: give --name, --redirect-uri or --scope"},
        Mistake{{"client", "add", "--name", kLong, "--redirect-uri", "a.example", "--scope", "r"},
                "2 --name must have 1 to 64 bytes, not 65"},
        Mistake{{"client", "add", "--name", "n", "--redirect-uri", "https://ab", "--scope", "r"},
                "2 --redirect-uri must have 3 to 2048 bytes, not 2"},
        Mistake{{"client", "add", "--name", "a\nb", "--redirect-uri", "a.example", "--scope", "r"},
                "2 --name holds a control character"},
        Mistake{{"log", "--match", "x", "clear", "--yes"},
                "2 'oauthctl log clear' does not take --match (see 'oauthctl log clear --help')"},
        Mistake{{"log", "--json", "clear", "--yes"},
                "2 'oauthctl log clear' does not take --json (see 'oauthctl log clear --help')"},
        Mistake{{"log", "clear", "--match", "x", "--yes"},
                "2 The following arguments were not expected: x --match (see 'oauthctl log clear "
                "--help')"},
        Mistake{{"backup", ""}, "2 FILE is empty"}));

TEST_F(UsageTest, KeepsTheCompletionCurrent) {
  EXPECT_EQ(oauthctl::bashCompletion(), bytesOf(OAUTHCTL_SOURCE "/oauthctl.bash"))
      << "in tools/oauthctl, run: " OAUTHCTL_DOCUMENTS " completion > oauthctl.bash";
}

TEST_F(UsageTest, KeepsTheManualCurrent) {
  const std::string page = oauthctl::manualPage(bytesOf(OAUTHCTL_SOURCE "/oauthctl.1.in"));
  EXPECT_EQ(page, bytesOf(OAUTHCTL_SOURCE "/oauthctl.1"))
      << "in tools/oauthctl, run: " OAUTHCTL_DOCUMENTS " manual < oauthctl.1.in > oauthctl.1";
  EXPECT_THAT(page, Not(HasSubstr("@"))) << "unknown placeholder";
}

// The words that bash offers to complete the last of these words.
std::string completed(const std::string& words) {
  const std::string script = "source \"" OAUTHCTL_SOURCE "/oauthctl.bash\"; COMP_WORDS=(" + words +
                             "); COMP_CWORD=$((${#COMP_WORDS[@]} - 1)); _oauthctl; "
                             "echo \"${COMPREPLY[@]}\"";
  std::FILE* const bash = popen(("bash -c '" + script + "'").c_str(), "r");
  std::string answer;
  for (int c = std::fgetc(bash); c != EOF; c = std::fgetc(bash)) answer += static_cast<char>(c);
  EXPECT_EQ(0, pclose(bash));
  return answer;
}

TEST_F(UsageTest, CompletesCommands) {
  EXPECT_EQ("check client code\n", completed("oauthctl c"));
  EXPECT_EQ("disable delete\n", completed("oauthctl client d"));
  EXPECT_EQ("--json --show-secrets --help\n", completed("oauthctl token show -"));
  EXPECT_EQ("clear --match --last --json --help\n", completed("oauthctl log \"\""));
  EXPECT_EQ("\n", completed("oauthctl token list --user a"));
  EXPECT_EQ("/dev/null\n", completed("oauthctl backup /dev/nul"));
}

}  // namespace
