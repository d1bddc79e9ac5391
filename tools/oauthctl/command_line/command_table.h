// The table of commands. The parser, the help, the bash completion and the manual page are all made
// from it.

#pragma once

#include <string>
#include <vector>

#include "terminal/invocation.h"

namespace oauthctl {

struct Operand {
  const char* name;  // "CLIENT"
  std::string help;
  bool isFile = false;
};

enum class Need {
  kOptional,
  kRequired,
  kOneOf  // exactly one of the options with this need
};

struct Option {
  const char* name;   // "--user"
  const char* value;  // "NAME", or nullptr for a switch
  std::string help;
  Need need = Need::kOptional;
};

struct Example {
  const char* line;
  const char* meaning;
};

struct Command {
  const char* path;     // "token revoke"
  const char* summary;  // one line, no full stop
  std::vector<Operand> operands;
  std::vector<Option> options;
  std::string details;  // paragraphs, one line each
  std::vector<Example> examples;
  // Throws a Failure unless all is well.
  void (*run)(const Invocation& invocation);
};

// The first word of several commands.
struct Group {
  const char* word;
  const char* summary;
};

const std::vector<Command>& commandTable();
const std::vector<Group>& commandGroups();

extern const char kProgramSummary[];

}  // namespace oauthctl
