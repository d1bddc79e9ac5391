// Finds the command, and the values of its operands and options, in the arguments of main().

#pragma once

#include <optional>
#include <string>

#include "command_line/command_table.h"
#include "terminal/invocation.h"

namespace oauthctl {

struct Request {
  const Command* command;
  Invocation invocation;
};

// If the operator asks for help or the version, returns nothing and sets output to that text.
// Throws a Failure if the arguments are wrong.
std::optional<Request> parseCommandLine(int argc, char** argv, std::string& output);

}  // namespace oauthctl
