// The one table of commands. The parser is filled from it; the help, the bash completion and the
// manual page are written from it.

#pragma once

#include <string>
#include <vector>

#include "invocation.h"

namespace oauthctl {

struct Operand {
  const char* name;  // "CLIENT"
  const char* help;
  bool isFile = false;
};

enum class Need {
  kOptional,
  kRequired,
  kOneOf  // exactly one of the options that say so
};

struct Option {
  const char* name;   // "--user"
  const char* value;  // "NAME", or nullptr for a switch
  const char* help;
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
  const char* details;  // paragraphs, one line each
  std::vector<Example> examples;
  // Throws a Failure for every other end than a good one.
  void (*run)(const Invocation& invocation);
};

// Words that begin commands of several words.
struct Group {
  const char* word;
  const char* summary;
};

const std::vector<Command>& commandTable();
const std::vector<Group>& commandGroups();

extern const char kProgramSummary[];

}  // namespace oauthctl
