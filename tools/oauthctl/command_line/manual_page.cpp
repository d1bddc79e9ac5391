#include <sstream>

#include "command_line/command_table.h"
#include "command_line/documents.h"
#include "command_line/help_text.h"
#include "database/fixed_paths.h"

namespace oauthctl {
namespace {

// The text in the form that roff prints as it is: its hyphens can be copied, and none of it is
// taken for a request.
std::string roff(const std::string& text) {
  std::string result;
  for (const char c : text) {
    if (c == '\\')
      result += "\\e";
    else if (c == '-')
      result += "\\-";
    else if (c == '\'')
      result += "\\(aq";
    else
      result += c;
  }
  return result.empty() || result.front() != '.' ? result : "\\&" + result;
}

std::string entry(const std::string& name, const std::string& meaning) {
  return ".TP\n.B " + roff(name) + "\n" + roff(meaning) + "\n";
}

std::string literal(const std::string& line) {
  return ".PP\n.RS 4\n.nf\n" + roff(line) + "\n.fi\n.RE\n";
}

std::string paragraphs(const std::string& text) {
  std::string result;
  std::istringstream stream(text);
  for (std::string line; std::getline(stream, line);) result += ".PP\n" + roff(line) + "\n";
  return result;
}

std::string section(const Command& command) {
  std::string text = ".SS \"" + roff(usageLine(command)) + "\"\n" + roff(command.summary) + ".\n";
  text += paragraphs(command.details);
  for (const Operand& operand : command.operands) text += entry(operand.name, operand.help);
  for (const Option& option : command.options) text += entry(spelling(option), option.help);
  for (const Example& example : command.examples)
    text += ".PP\nExample, " + roff(example.meaning) + ":\n" + literal(example.line);
  return text;
}

// Replaces every occurrence.
void replace(std::string& text, const std::string& placeholder, const std::string& value) {
  for (std::size_t at = 0; (at = text.find(placeholder, at)) != std::string::npos;
       at += value.size())
    text.replace(at, placeholder.size(), value);
}

}  // namespace

std::string manualPage(std::string pageTemplate) {
  std::string commands;
  for (const Command& command : commandTable()) commands += section(command);
  replace(pageTemplate, "@SUMMARY@", roff(kProgramSummary));
  replace(pageTemplate, "@COMMANDS@\n", commands);
  replace(pageTemplate, "@DATABASE@", roff(fixed_paths::database()));
  replace(pageTemplate, "@SETTINGS@", roff(fixed_paths::settings()));
  return pageTemplate;
}

}  // namespace oauthctl
