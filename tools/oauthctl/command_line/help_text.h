// The help, made from the table of commands.

#pragma once

#include <string>

#include "command_line/command_table.h"

namespace oauthctl {

// "--user NAME"
std::string spelling(const Option& option);

// "oauthctl token list [--user NAME] ..."
std::string usageLine(const Command& command);

std::string programHelp();
std::string groupHelp(const std::string& word);
std::string commandHelp(const Command& command);

// Breaks the text into lines of at most this width. Every line but the first is indented. Words are
// not broken.
std::string wrapped(const std::string& text, std::size_t indent, std::size_t width = 80);

}  // namespace oauthctl
