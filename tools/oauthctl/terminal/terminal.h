// Talks with the person at the terminal, if there is one.

#pragma once

#include <chrono>
#include <cstddef>
#include <string>

#include "terminal/invocation.h"

namespace oauthctl {

// Whether a terminal may get escape sequences: not if TERM is "dumb" or NO_COLOR is set.
bool takesEscapeSequences();

// Writes one line to standard output, escaped.
void say(const std::string& line);

// Asks the question, and returns if the operator agrees, by --yes or on the terminal. Throws
// otherwise, and where there is nobody to ask.
void confirm(const Invocation& invocation, const std::string& question);

// Reads a secret from standard input, without its line end. A terminal does not show what is typed,
// and shows it again when the program ends, also by Ctrl-C.
// Throws if there is no secret, or if it holds a NUL byte.
std::string readSecret(const std::string& prompt);

// Shows the progress of long work on standard error, if that is a terminal that takes escape
// sequences. The destructor erases the line.
class Progress {
 public:
  Progress(std::string label, std::size_t total);
  ~Progress();
  Progress(const Progress&) = delete;
  Progress& operator=(const Progress&) = delete;

  void update(std::size_t done);

 private:
  const std::string label_;
  const std::size_t total_;
  const bool visible_;
  bool shown_ = false;
  std::chrono::steady_clock::time_point next_;
};

}  // namespace oauthctl
