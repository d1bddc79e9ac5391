// One line to the system log, always "<file>:<line> <text>".
//
//   OAUTH_FAIL   a failure, always sent           OAUTH_FAIL("Add failed[%s]", table.c_str());
//   OAUTH_DIAG   sent if its class is switched on   OAUTH_DIAG(kResult, "changed[%d]", count);
//   OAUTH_ENTER  entry trace, first statement of an operation; never inside a lambda, whose
//                __func__ is "operator()"
//   OAUTH_LOG    any priority, for example LOG_AUTH | LOG_INFO
//   OAUTH_LOG_AT   the same as an expression, with the file's name and the line given
//
// Macros, because only they know file and line; the format stays a literal, so that the compiler
// checks it, and no argument is evaluated for a diagnostic that is switched off.

#pragma once

#include <syslog.h>

#include "oauth_utils.h"

namespace ZEVOOAUTHSERVER::diagnostics {

// Bits of the mask that getLogLevel() returns.
enum Class : int { kResult = 1, kRow = 2, kArgument = 4, kEntry = 8 };

// The file's name without its folders, also in a build outside the source tree.
constexpr const char* baseName(const char* path) {
  const char* name = path;
  for (const char* p = path; *p != '\0'; ++p)
    if (*p == '/') name = p + 1;
  return name;
}

inline bool wants(Class c) { return isDebugEnabled() && (getLogLevel() & c) != 0; }

}  // namespace ZEVOOAUTHSERVER::diagnostics

#define OAUTH_LOG_AT(file, line, priority, format, ...) \
  syslog((priority), "%s:%d " format, (file), (line), ##__VA_ARGS__)
#define OAUTH_LOG(priority, format, ...)                                                  \
  do {                                                                                    \
    constexpr const char* oauthFile = ::ZEVOOAUTHSERVER::diagnostics::baseName(__FILE__); \
    OAUTH_LOG_AT(oauthFile, __LINE__, priority, format, ##__VA_ARGS__);                   \
  } while (0)
#define OAUTH_FAIL(format, ...) OAUTH_LOG(LOG_ERR, format, ##__VA_ARGS__)
#define OAUTH_DIAG(klass, format, ...)                                                \
  do {                                                                                \
    if (::ZEVOOAUTHSERVER::diagnostics::wants(::ZEVOOAUTHSERVER::diagnostics::klass)) \
      OAUTH_LOG(LOG_ERR, format, ##__VA_ARGS__);                                      \
  } while (0)
#define OAUTH_ENTER() OAUTH_DIAG(kEntry, "==> %s", __func__)
