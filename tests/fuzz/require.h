// Checks that must hold for every input.

#pragma once

#include <string>

// Ends the program with the text, which the fuzzer reports along with the input.
[[noreturn]] void finding(const std::string& text);

inline void require(bool condition, const char* text) {
  if (!condition) finding(text);
}
