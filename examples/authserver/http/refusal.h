// The answer to a request that cannot be served. It is the only exception whose text leaves the
// server.

#pragma once

#include <stdexcept>
#include <string>
#include <utility>
#include <vector>

namespace authserver {

using Headers = std::vector<std::pair<std::string, std::string>>;

// status is that of HTTP, error is an error code of RFC 6749, section 5.2, or of an RFC that
// extends it. what() explains it, in ASCII without quotes and backslashes, as that section
// requires.
class Refusal : public std::runtime_error {
 public:
  Refusal(int httpStatus, std::string errorCode, const std::string& words, Headers extra = {})
      : std::runtime_error(words),
        status(httpStatus),
        error(std::move(errorCode)),
        headers(std::move(extra)) {}

  const int status;
  const std::string error;
  const Headers headers;
};

inline Refusal invalidRequest(const std::string& words) { return {400, "invalid_request", words}; }
inline Refusal invalidGrant(const std::string& words) { return {400, "invalid_grant", words}; }
inline Refusal invalidScope(const std::string& words) { return {400, "invalid_scope", words}; }

// For a request that may be correct: the same one may succeed a little later.
inline Refusal temporarilyUnavailable() {
  constexpr char kRetryAfter[] = "5";  // seconds, as long as a statement waits for a lock
  return {503,
          "temporarily_unavailable",
          "The server is busy. Try again in a few seconds.",
          {{"Retry-After", kRetryAfter}}};
}

}  // namespace authserver
