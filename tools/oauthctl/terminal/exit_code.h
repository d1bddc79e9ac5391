// How a command ends: it returns, or it throws a Failure that says what went wrong.

#pragma once

#include <stdexcept>
#include <string>

namespace oauthctl {

enum class ExitCode {
  kFine = 0,
  kAttention = 1,   // something needs attention, or was not found
  kUsage = 2,       // wrong usage
  kUnavailable = 3  // the database is busy or cannot be opened
};

// Holds the one line for standard error, without the program's name.
class Failure : public std::runtime_error {
 public:
  Failure(ExitCode code, const std::string& line) : std::runtime_error(line), code_(code) {}
  ExitCode code() const { return code_; }

 private:
  ExitCode code_;
};

[[noreturn]] inline void throwUnavailable(const std::string& line) {
  throw Failure(ExitCode::kUnavailable, line);
}

}  // namespace oauthctl
