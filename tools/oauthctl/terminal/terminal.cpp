#include "terminal/terminal.h"

#include <termios.h>
#include <unistd.h>

#include <csignal>
#include <cstdio>
#include <cstdlib>
#include <cstring>
#include <iterator>
#include <utility>

#include "terminal/escaping.h"
#include "terminal/exit_code.h"

namespace oauthctl {
namespace {

bool isInteractive() { return isatty(STDIN_FILENO) != 0 && isatty(STDERR_FILENO) != 0; }

// Reads a line without its end; false at the end of the input. A line longer than any secret is
// cut.
bool readLine(std::string& line) {
  constexpr std::size_t kLongest = 4096;
  line.clear();
  int c = std::getchar();
  if (c == EOF) return false;
  for (; c != EOF && c != '\n'; c = std::getchar())
    if (line.size() < kLongest) line += static_cast<char>(c);
  if (!line.empty() && line.back() == '\r') line.pop_back();
  return true;
}

constexpr int kEndingSignals[] = {SIGINT, SIGQUIT, SIGTERM, SIGHUP};
termios settingsBefore;  // of the terminal, for restoreAndEnd()

// The signal has its usual effect when it comes again.
void restoreAndEnd(int signal) {
  tcsetattr(STDIN_FILENO, TCSAFLUSH, &settingsBefore);
  raise(signal);
}

// The terminal does not show what is typed during the life of the object.
class EchoOff {
 public:
  EchoOff() {
    if (tcgetattr(STDIN_FILENO, &settingsBefore) != 0) return;
    isTerminal_ = true;
    struct sigaction action = {};
    action.sa_handler = restoreAndEnd;
    action.sa_flags = static_cast<int>(SA_RESETHAND);
    for (std::size_t i = 0; i < std::size(kEndingSignals); ++i) {
      sigaction(kEndingSignals[i], &action, &actionsBefore_[i]);
      if (actionsBefore_[i].sa_handler == SIG_IGN)  // an ignored signal stays ignored
        sigaction(kEndingSignals[i], &actionsBefore_[i], nullptr);
    }
    termios silent = settingsBefore;
    silent.c_lflag &= ~static_cast<tcflag_t>(ECHO);
    tcsetattr(STDIN_FILENO, TCSAFLUSH, &silent);
  }
  ~EchoOff() {
    if (!isTerminal_) return;
    tcsetattr(STDIN_FILENO, TCSAFLUSH, &settingsBefore);
    for (std::size_t i = 0; i < std::size(kEndingSignals); ++i)
      sigaction(kEndingSignals[i], &actionsBefore_[i], nullptr);
  }
  EchoOff(const EchoOff&) = delete;
  EchoOff& operator=(const EchoOff&) = delete;

 private:
  bool isTerminal_ = false;
  struct sigaction actionsBefore_[std::size(kEndingSignals)] = {};
};

}  // namespace

bool takesEscapeSequences() {
  const char *const noColor = std::getenv("NO_COLOR"), *const type = std::getenv("TERM");
  return (noColor == nullptr || *noColor == '\0') &&
         (type == nullptr || std::strcmp(type, "dumb") != 0);
}

void say(const std::string& line) { std::printf("%s\n", escaped(line).c_str()); }

void confirm(const Invocation& invocation, const std::string& question) {
  if (invocation.has("--yes")) return;
  if (!isInteractive())
    throw Failure(ExitCode::kUsage, "nobody is there to ask \"" + question + "\": add --yes");
  std::fprintf(stderr, "%s [y/N] ", escaped(question).c_str());
  std::string answer;
  if (!readLine(answer)) std::fputc('\n', stderr);
  if (answer != "y" && answer != "Y" && answer != "yes")
    throw Failure(ExitCode::kAttention, "not confirmed, nothing changed");
}

std::string readSecret(const std::string& prompt) {
  std::string secret;
  if (!isInteractive()) {
    readLine(secret);
  } else {
    const EchoOff echoOff;
    std::fprintf(stderr, "%s: ", prompt.c_str());
    readLine(secret);
    std::fputc('\n', stderr);
  }
  if (secret.empty()) throw Failure(ExitCode::kUsage, "standard input holds no " + prompt);
  // For the library a text ends at its first NUL byte.
  if (secret.find('\0') != std::string::npos)
    throw Failure(ExitCode::kUsage, "the " + prompt + " on standard input holds a NUL byte");
  return secret;
}

constexpr std::size_t kLongWork = 500;  // steps; shorter work ends before anybody can read the line

Progress::Progress(std::string label, std::size_t total)
    : label_(std::move(label)),
      total_(total),
      visible_(total >= kLongWork && isatty(STDERR_FILENO) != 0 && takesEscapeSequences()),
      next_(std::chrono::steady_clock::now()) {}

Progress::~Progress() {
  if (shown_) std::fputs("\r\x1b[K", stderr);
}

void Progress::update(std::size_t done) {
  const auto now = std::chrono::steady_clock::now();
  if (!visible_ || now < next_) return;
  next_ = now + std::chrono::milliseconds(100);
  shown_ = true;
  std::fprintf(stderr, "\r%s: %zu of %zu\x1b[K", label_.c_str(), done, total_);
  std::fflush(stderr);
}

}  // namespace oauthctl
