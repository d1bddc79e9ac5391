// Dealing with the person at the terminal, if there is one.

#pragma once

#include <chrono>
#include <cstddef>
#include <string>

#include "invocation.h"

namespace oauthctl {

// Standard output is a terminal that wants colour: NO_COLOR is unset or empty.
bool wantsColour();

// Writes one line to standard output, escaped.
void say(const std::string& line);

// Returns if the operator agrees to what is about to happen, given as a question: by --yes, or by
// answering on the terminal. Throws otherwise, and where there is nobody to ask.
void confirm(const Invocation& invocation, const std::string& question);

// A secret from standard input, its line end removed: typed unseen on a terminal, or piped. Throws
// if there is none, or if it holds a NUL byte.
std::string readSecret(const std::string& prompt);

// How far long work has come, on standard error while that is a terminal; gone when it is done.
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
