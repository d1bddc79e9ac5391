// From the arguments of main() to a command and what was asked of it.

#pragma once

#include <optional>
#include <string>

#include "command_table.h"
#include "invocation.h"

namespace oauthctl {

struct Request {
  const Command* command;
  Invocation invocation;
};

// Nothing where help or the version was asked for, which then stands in output. Throws a Failure
// for arguments that make no sense.
std::optional<Request> parseCommandLine(int argc, char** argv, std::string& output);

}  // namespace oauthctl
