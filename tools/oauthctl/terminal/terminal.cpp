#include "terminal.h"

#include <termios.h>
#include <unistd.h>

#include <cstdio>
#include <cstdlib>
#include <utility>

#include "escaping.h"
#include "exit_code.h"

namespace oauthctl {
namespace {

bool somebodyCanAnswer() { return isatty(STDIN_FILENO) != 0 && isatty(STDERR_FILENO) != 0; }

// A line without its end; false at the end of the input. Longer lines than any secret are cut.
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

class UnseenTyping {
 public:
  UnseenTyping() {
    if (tcgetattr(STDIN_FILENO, &before_) != 0) return;
    termios unseen = before_;
    unseen.c_lflag &= ~static_cast<tcflag_t>(ECHO);
    changed_ = tcsetattr(STDIN_FILENO, TCSAFLUSH, &unseen) == 0;
  }
  ~UnseenTyping() {
    if (changed_) tcsetattr(STDIN_FILENO, TCSAFLUSH, &before_);
  }
  UnseenTyping(const UnseenTyping&) = delete;
  UnseenTyping& operator=(const UnseenTyping&) = delete;

 private:
  termios before_ = {};
  bool changed_ = false;
};

}  // namespace

bool wantsColour() {
  const char* const no = std::getenv("NO_COLOR");
  return isatty(STDOUT_FILENO) != 0 && (no == nullptr || *no == '\0');
}

void say(const std::string& line) { std::printf("%s\n", escaped(line).c_str()); }

void confirm(const Invocation& invocation, const std::string& question) {
  if (invocation.has("--yes")) return;
  if (!somebodyCanAnswer())
    throw Failure(ExitCode::kUsage, "nobody is there to ask \"" + question + "\": add --yes");
  std::fprintf(stderr, "%s [y/N] ", escaped(question).c_str());
  std::string answer;
  if (!readLine(answer)) std::fputc('\n', stderr);
  if (answer != "y" && answer != "Y" && answer != "yes")
    throw Failure(ExitCode::kAttention, "not confirmed, nothing changed");
}

std::string readSecret(const std::string& prompt) {
  std::string secret;
  if (!somebodyCanAnswer()) {
    readLine(secret);
  } else {
    const UnseenTyping unseen;
    std::fprintf(stderr, "%s: ", prompt.c_str());
    readLine(secret);
    std::fputc('\n', stderr);
  }
  if (secret.empty()) throw Failure(ExitCode::kUsage, "standard input holds no " + prompt);
  // The library takes a text to end there.
  if (secret.find('\0') != std::string::npos)
    throw Failure(ExitCode::kUsage, "the " + prompt + " on standard input holds a NUL byte");
  return secret;
}

constexpr std::size_t kLongWork = 500;  // steps; less is over before it can be read

Progress::Progress(std::string label, std::size_t total)
    : label_(std::move(label)),
      total_(total),
      visible_(total >= kLongWork && isatty(STDERR_FILENO) != 0),
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
