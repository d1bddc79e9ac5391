// The request that the web server passes to the program (RFC 3875), read once and checked.

#pragma once

#include <map>
#include <optional>
#include <string>
#include <vector>

namespace authserver {

class Request {
 public:
  // Reads the environment and, for a POST, the form on standard input. Refuses methods other than
  // those given, where HEAD counts as GET, and a body that is not a form or is too large.
  explicit Request(const std::vector<std::string>& methods);

  bool isPost() const { return post_; }

  // Value of a parameter, "" if it is absent: RFC 6749, section 3.1, treats both in the same way. A
  // parameter that was sent twice, is too long or holds control characters counts as absent.
  std::string get(const std::string& name) const;

  // The same, but refuses the request if the value is "".
  std::string required(const std::string& name) const;

  // Refuses the request if get() treats a parameter as absent that was sent.
  void requireSoundParameters() const;

  // All cookies of that name: a browser may send several.
  std::vector<std::string> cookies(const std::string& name) const;

  // Value of the header Authorization, "" if it is absent.
  static std::string authorization();

  // What follows the scheme, for example "Basic", in the header Authorization; nothing if the
  // header is absent or has another scheme.
  static std::optional<std::string> credentials(const std::string& scheme);

 private:
  void read();

  bool post_ = false;
  std::map<std::string, std::string> parameters_;
  std::string problem_;  // what is wrong with a parameter, "" if all are sound
  std::vector<std::pair<std::string, std::string>> cookies_;
};

}  // namespace authserver
