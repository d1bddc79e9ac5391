// Makes texts from the database safe for a terminal.

#pragma once

#include <string>

namespace oauthctl {

// Printable characters stay as they are. Everything else becomes an escape sequence: "\n", "\t",
// "\\", "\x1b" for a byte, "\u202e" for a character. That covers control characters of both kinds,
// invalid UTF-8, and characters that change the direction of the text or are invisible. If the
// terminal's encoding is not UTF-8, every character beyond ASCII is escaped.
std::string escaped(const std::string& text);

// The text with U+FFFD, the replacement character, for each byte that is not valid UTF-8.
std::string validUtf8(const std::string& text);

// The secret, or unless it is to be shown only its beginning: enough to tell two of them apart.
std::string masked(const std::string& secret, bool show);

// Sets the character encoding of escaped() and the tables: that of the operator's locale, or UTF-8
// if the system does not have that locale. main() calls it once.
void useTextEncoding();

}  // namespace oauthctl
