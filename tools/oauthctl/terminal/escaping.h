// Texts from the database, made safe for a terminal.

#pragma once

#include <string>

namespace oauthctl {

// Printable characters as they are, everything else spelt out: "\n", "\t", "\\", "\x1b" for a byte,
// "\u202e" for a character. That covers control characters of both kinds, invalid UTF-8, and what
// changes the direction of the text or takes no room. Where the terminal's text is not UTF-8,
// every character beyond ASCII is spelt out.
std::string escaped(const std::string& text);

// Picks the character encoding that escaped() and the tables count on. Called once, by main().
void useTextEncoding();

}  // namespace oauthctl
