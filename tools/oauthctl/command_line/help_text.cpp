#include "command_line/help_text.h"

#include <algorithm>
#include <sstream>
#include <utility>

namespace oauthctl {
namespace {

using Entries = std::vector<std::pair<std::string, std::string>>;

std::string aligned(const Entries& entries) {
  std::size_t width = 0;
  for (const auto& entry : entries) width = std::max(width, entry.first.size());
  std::string text;
  for (const auto& [name, meaning] : entries)
    text += "  " + name + std::string(width - name.size() + 2, ' ') + wrapped(meaning, width + 4) +
            "\n";
  return text;
}

bool isInGroup(const Command& command, const std::string& word) {
  return std::string(command.path).rfind(word + " ", 0) == 0;
}

Entries commandsOf(const std::string& word) {
  Entries entries;
  for (const Command& command : commandTable())
    if (isInGroup(command, word)) entries.emplace_back(command.path, command.summary);
  return entries;
}

}  // namespace

std::string wrapped(const std::string& text, std::size_t indent, std::size_t width) {
  std::istringstream words(text);
  std::string result, word;
  std::size_t column = indent;
  while (words >> word) {
    if (!result.empty() && column + 1 + word.size() > width) {
      result += "\n" + std::string(indent, ' ');
      column = indent;
    } else if (!result.empty()) {
      result += ' ';
      ++column;
    }
    result += word;
    column += word.size();
  }
  return result;
}

std::string spelling(const Option& option) {
  std::string text = option.name;
  if (option.value != nullptr) text.append(" ").append(option.value);
  return text;
}

std::string usageLine(const Command& command) {
  std::string line = std::string("oauthctl ") + command.path;
  for (const Operand& operand : command.operands) line.append(" ").append(operand.name);
  std::string choice;
  for (const Option& option : command.options)
    if (option.need == Need::kOneOf) choice += (choice.empty() ? "" : " | ") + spelling(option);
  if (!choice.empty()) line += " (" + choice + ")";
  for (const Option& option : command.options) {
    if (option.need == Need::kRequired) line += " " + spelling(option);
    if (option.need == Need::kOptional) line += " [" + spelling(option) + "]";
  }
  return line;
}

std::string commandHelp(const Command& command) {
  std::string text =
      "Usage: " + wrapped(usageLine(command), 7) + "\n\n" + command.summary + ".\n\n";
  Entries entries;
  for (const Operand& operand : command.operands) entries.emplace_back(operand.name, operand.help);
  for (const Option& option : command.options) entries.emplace_back(spelling(option), option.help);
  entries.emplace_back("-h, --help", "this help");
  text += aligned(entries);
  std::istringstream details(command.details);
  for (std::string paragraph; std::getline(details, paragraph);)
    text += "\n" + wrapped(paragraph, 0) + "\n";
  text += command.examples.size() == 1 ? "\nExample:\n" : "\nExamples:\n";
  for (const Example& example : command.examples)
    text += std::string("  ") + example.line + "\n      " + example.meaning + "\n";
  return text;
}

std::string groupHelp(const std::string& word) {
  std::string text = "Usage: oauthctl " + word + " COMMAND ...\n\n";
  for (const Group& group : commandGroups())
    if (word == group.word) text += std::string(group.summary) + ".\n\n";
  text += aligned(commandsOf(word));
  return text + "\nHelp and examples for each: oauthctl " + word + " COMMAND --help\n";
}

std::string programHelp() {
  std::string text =
      std::string("Usage: oauthctl COMMAND ...\n\noauthctl - ") + kProgramSummary + "\n\n";
  Entries entries;
  for (const Command& command : commandTable()) entries.emplace_back(command.path, command.summary);
  entries.emplace_back("-h, --help", "this help; oauthctl COMMAND --help for more, with examples");
  entries.emplace_back("--version", "the version of this program");
  return text + aligned(entries) +
         "\nEnds with 0: fine, 1: something needs attention or was not found, 2: wrong\n"
         "usage, 3: the database is busy or cannot be opened. The manual, oauthctl(1), has\n"
         "a first session to follow.\n\nExample:\n  oauthctl status\n      what is in there, and "
         "is it nearly full\n";
}

}  // namespace oauthctl
