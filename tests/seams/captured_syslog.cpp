#include "captured_syslog.h"

#include <syslog.h>

#include <algorithm>
#include <cerrno>
#include <cstdarg>
#include <cstdio>
#include <mutex>

#include "own_work.h"

namespace {

struct Entry {
  int priority;
  std::string format, text;
};

std::mutex guard;
std::vector<Entry> entries;
CapturedSyslog* current = nullptr;
int leftErrno = 0;

[[gnu::format(printf, 2, 0)]] void record(int priority, const char* format, va_list arguments) {
  const OwnWork seam;
  va_list again;
  va_copy(again, arguments);
  const int length = std::vsnprintf(nullptr, 0, format, arguments);
  std::string text(static_cast<std::size_t>(std::max(length, 0)), '\0');
  std::vsnprintf(text.data(), text.size() + 1, format, again);
  va_end(again);
  const std::lock_guard<std::mutex> lock(guard);
  if (current != nullptr) entries.push_back({priority, format, text});
  if (leftErrno != 0) errno = leftErrno;
}

// "oauth_token.cpp:12 Bad parameters" -> "oauth_token.cpp Bad parameters"
std::string withoutLineNumber(const std::string& text) {
  const std::size_t colon = text.find(':');
  const std::size_t blank = text.find_first_not_of("0123456789", colon + 1);
  if (colon == std::string::npos || blank == colon + 1 || blank == std::string::npos ||
      text[blank] != ' ')
    return text;
  return text.substr(0, colon) + text.substr(blank);
}

template <class Print>
std::vector<std::string> printed(Print print) {
  const std::lock_guard<std::mutex> lock(guard);
  std::vector<std::string> result;
  result.reserve(entries.size());
  for (const Entry& entry : entries) result.push_back(print(entry));
  return result;
}

}  // namespace

CapturedSyslog::CapturedSyslog() {
  const std::lock_guard<std::mutex> lock(guard);
  entries.clear();
  current = this;
  leftErrno = 0;
}

CapturedSyslog::~CapturedSyslog() {
  const std::lock_guard<std::mutex> lock(guard);
  current = nullptr;
}

std::vector<std::string> CapturedSyslog::lines() const {
  return printed([](const Entry& entry) {
    return std::to_string(entry.priority) + " " + withoutLineNumber(entry.text);
  });
}

std::vector<std::string> CapturedSyslog::formats() const {
  return printed([](const Entry& entry) { return entry.format; });
}

void CapturedSyslog::leaveErrno(int error) {
  const std::lock_guard<std::mutex> lock(guard);
  leftErrno = error;
}

void CapturedSyslog::clear() {
  const std::lock_guard<std::mutex> lock(guard);
  entries.clear();
}

extern "C" void syslog(int priority, const char* format, ...) {
  va_list arguments;
  va_start(arguments, format);
  record(priority, format, arguments);
  va_end(arguments);
}

// With _FORTIFY_SOURCE the compiler calls this function instead.
extern "C" [[gnu::format(printf, 3, 4)]] void syslogChk(int priority, int, const char* format,
                                                        ...) __asm__("__syslog_chk");
extern "C" void syslogChk(int priority, int, const char* format, ...) {
  va_list arguments;
  va_start(arguments, format);
  record(priority, format, arguments);
  va_end(arguments);
}
