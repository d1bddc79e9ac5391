// What a client is told when its request cannot be served: the one exception of these programs
// that is meant for the outside.

#pragma once

#include <stdexcept>
#include <string>
#include <utility>
#include <vector>

namespace authserver {

using Headers = std::vector<std::pair<std::string, std::string>>;

// status is HTTP's; error is a code of RFC 6749, section 5.2, or of a relative; what() says it in
// words, in ASCII without quotes and backslashes, as that section asks.
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

// Nothing is known to be wrong with the request: the same one may succeed a little later.
inline Refusal temporarilyUnavailable() {
  constexpr char kRetryAfter[] = "5";  // seconds, as long as a statement waits for its turn
  return {503,
          "temporarily_unavailable",
          "The server is busy. Try again in a few seconds.",
          {{"Retry-After", kRetryAfter}}};
}

}  // namespace authserver
