#include "terminal/escaping.h"

#include <langinfo.h>

#include <clocale>
#include <cstdio>
#include <cstring>
#include <cwctype>

namespace oauthctl {
namespace {

bool terminalUsesUtf8() { return std::strcmp(nl_langinfo(CODESET), "UTF-8") == 0; }

// A backslash, the letter for the kind of number, and hexadecimal digits: "\x1b".
std::string escapeSequence(char kind, int digits, unsigned value) {
  char buffer[16];
  std::snprintf(buffer, sizeof buffer, "\\%c%0*x", kind, digits, value);
  return buffer;
}

struct Character {
  unsigned code;
  int length;  // bytes; 0 if there is no valid character
};

// The first character of the text. Overlong forms, surrogates and numbers beyond Unicode are not
// valid.
Character firstCharacter(const char* text, const char* end) {
  const auto first = static_cast<unsigned char>(*text);
  if (first < 0x80) return {first, 1};
  const int length = first >= 0xF0 ? 4 : first >= 0xE0 ? 3 : 2;
  if (first < 0xC2 || first > 0xF4 || end - text < length) return {0, 0};
  unsigned code = first & (0xFFU >> (length + 1));
  for (int i = 1; i < length; ++i) {
    const auto next = static_cast<unsigned char>(text[i]);
    if ((next & 0xC0U) != 0x80) return {0, 0};
    code = code << 6 | (next & 0x3FU);
  }
  constexpr unsigned kSmallest[] = {0, 0, 0x80, 0x800, 0x10000};
  const bool surrogate = code >= 0xD800 && code <= 0xDFFF;
  if (code < kSmallest[length] || surrogate || code > 0x10FFFF) return {0, 0};
  return {code, length};
}

// Direction marks, joiners and byte-order marks: a terminal shows nothing for them, and they can
// change how other text looks.
bool isInvisible(unsigned code) {
  return (code >= 0x200B && code <= 0x200F) || (code >= 0x2028 && code <= 0x202E) ||
         (code >= 0x2060 && code <= 0x206F) || code == 0xFEFF || code == 0x061C || code == 0x00AD ||
         (code >= 0xE0000 && code <= 0xE0FFF);
}

std::string printableForm(Character character, const char* bytes) {
  switch (character.code) {
    case '\n':
      return "\\n";
    case '\t':
      return "\\t";
    case '\r':
      return "\\r";
    case '\\':
      return "\\\\";
    default:
      break;
  }
  if (character.code < 0x20 || character.code == 0x7F)
    return escapeSequence('x', 2, character.code);
  const bool printable =
      character.code < 0x7F || (terminalUsesUtf8() && !isInvisible(character.code) &&
                                std::iswprint(static_cast<std::wint_t>(character.code)) != 0);
  if (printable) return {bytes, static_cast<std::size_t>(character.length)};
  return character.code > 0xFFFF ? escapeSequence('U', 8, character.code)
                                 : escapeSequence('u', 4, character.code);
}

}  // namespace

std::string escaped(const std::string& text) {
  std::string result;
  const char* const end = text.data() + text.size();
  for (const char* at = text.data(); at != end;) {
    const Character character = firstCharacter(at, end);
    if (character.length == 0) {
      result += escapeSequence('x', 2, static_cast<unsigned char>(*at++));
      continue;
    }
    result += printableForm(character, at);
    at += character.length;
  }
  return result;
}

std::string validUtf8(const std::string& text) {
  constexpr char kReplacement[] = "\xEF\xBF\xBD";
  std::string result;
  const char* const end = text.data() + text.size();
  for (const char* at = text.data(); at != end;) {
    const int length = firstCharacter(at, end).length;
    if (length == 0)
      result += kReplacement;
    else
      result.append(at, static_cast<std::size_t>(length));
    at += length == 0 ? 1 : length;
  }
  return result;
}

std::string masked(const std::string& secret, bool show) {
  constexpr std::size_t kShown = 4, kLongEnough = 32;
  if (show) return secret;
  return (secret.size() < kLongEnough ? std::string() : secret.substr(0, kShown)) + "...";
}

void useTextEncoding() {
  // A small system has not installed every locale that a terminal asks for.
  if (std::setlocale(LC_CTYPE, "") == nullptr) std::setlocale(LC_CTYPE, "C.UTF-8");
}

}  // namespace oauthctl
