// The help, as it is written from the table of commands.

#pragma once

#include <string>

#include "command_table.h"

namespace oauthctl {

// "oauthctl token list [--user NAME] ..."
std::string usageLine(const Command& command);

std::string programHelp();
std::string groupHelp(const std::string& word);
std::string commandHelp(const Command& command);

// Lines of at most this width, each but the first after this many blanks. Words are not broken.
std::string filled(const std::string& text, std::size_t indent, std::size_t width = 80);

}  // namespace oauthctl
