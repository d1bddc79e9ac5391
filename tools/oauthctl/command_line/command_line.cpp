#include "command_line/command_line.h"

#include <CLI/CLI.hpp>
#include <map>
#include <sstream>

#include "command_line/help_text.h"
#include "terminal/exit_code.h"

namespace oauthctl {
namespace {

using Parsers = std::map<const CLI::App*, const Command*>;

// The parser of one command. Also adds the parsers of the words before its last one.
CLI::App* parserOf(CLI::App& program, const Command& command) {
  CLI::App* parser = &program;
  std::istringstream words(command.path);
  for (std::string word; words >> word;) {
    const auto known = parser->get_subcommands([&](CLI::App* p) { return p->get_name() == word; });
    parser = known.empty() ? parser->add_subcommand(word) : known.front();
  }
  return parser;
}

void addArguments(CLI::App& parser, const Command& command) {
  for (const Operand& operand : command.operands) parser.add_option(operand.name)->required();
  for (const Option& option : command.options) {
    if (option.value == nullptr)
      parser.add_flag(option.name);
    else
      parser.add_option(option.name)
          ->type_name(option.value)
          ->required(option.need == Need::kRequired);
  }
}

// The parser of the last word that names a command.
CLI::App* chosenParser(CLI::App& parser) {
  const std::vector<CLI::App*> chosen = parser.get_subcommands();
  return chosen.empty() ? &parser : chosenParser(*chosen.front());
}

// "oauthctl token list"
std::string fullName(const CLI::App& parser) {
  const CLI::App* const parent = parser.get_parent();
  return parent == nullptr ? "oauthctl" : fullName(*parent) + " " + parser.get_name();
}

[[noreturn]] void throwUsage(const CLI::App& parser, const std::string& problem) {
  throw Failure(ExitCode::kUsage, problem + " (see '" + fullName(parser) + " --help')");
}

// The parser takes the options of "log" before the word "clear", too. There they would have no
// effect.
void requireOwnOptions(const CLI::App& parser) {
  for (const CLI::App* above = parser.get_parent(); above != nullptr; above = above->get_parent())
    for (const CLI::Option* const option : above->get_options())
      if (option->count() > 0)
        throwUsage(parser, "'" + fullName(parser) + "' does not take " + option->get_name());
}

void requireOneOf(const CLI::App& parser, const Command& command, const Invocation& invocation) {
  std::string names;
  int given = 0;
  for (const Option& option : command.options) {
    if (option.need != Need::kOneOf) continue;
    names += (names.empty() ? "" : ", ") + std::string(option.name);
    given += invocation.has(option.name) ? 1 : 0;
  }
  if (!names.empty() && given != 1) throwUsage(parser, "give exactly one of " + names);
}

Invocation valuesOf(const CLI::App& parser, const Command& command) {
  std::map<std::string, std::string> values;
  const auto addValue = [&](const char* name) {
    const CLI::Option* const option = parser.get_option(name);
    if (option->count() > 0) values[name] = option->results().back();
  };
  for (const Operand& operand : command.operands) addValue(operand.name);
  for (const Option& option : command.options) addValue(option.name);
  return Invocation(values);
}

std::string helpFor(CLI::App& program, const Parsers& parsers) {
  const CLI::App* const parser = chosenParser(program);
  if (parser == &program) return programHelp();
  const auto command = parsers.find(parser);
  return command == parsers.end() ? groupHelp(parser->get_name()) : commandHelp(*command->second);
}

// The parser explains some mistakes in several lines.
std::string firstLine(const std::string& text) { return text.substr(0, text.find('\n')); }

}  // namespace

std::optional<Request> parseCommandLine(int argc, char** argv, std::string& output) {
  CLI::App program;
  program.set_help_flag("-h,--help");
  program.set_version_flag("--version", "oauthctl " OAUTHCTL_VERSION);
  Parsers parsers;
  for (const Command& command : commandTable()) {
    CLI::App* const parser = parserOf(program, command);
    addArguments(*parser, command);
    parsers[parser] = &command;
  }
  try {
    program.parse(argc, argv);
  } catch (const CLI::CallForHelp&) {
    output = helpFor(program, parsers);
    return std::nullopt;
  } catch (const CLI::CallForVersion& version) {
    output = version.what();
    output += '\n';
    return std::nullopt;
  } catch (const CLI::ParseError& error) {
    throwUsage(*chosenParser(program), firstLine(error.what()));
  }
  CLI::App* const parser = chosenParser(program);
  const auto command = parsers.find(parser);
  if (command == parsers.end()) throwUsage(*parser, "a command is missing");
  requireOwnOptions(*parser);
  Request request{command->second, valuesOf(*parser, *command->second)};
  requireOneOf(*parser, *command->second, request.invocation);
  return request;
}

}  // namespace oauthctl
