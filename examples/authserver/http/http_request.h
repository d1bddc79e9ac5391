// The request as the web server hands it over (RFC 3875), read once and checked.

#pragma once

#include <map>
#include <string>
#include <vector>

namespace authserver {

class Request {
 public:
  // Reads the environment and, for a POST, the form on standard input. Refuses other methods than
  // those given, HEAD counting as GET, and bodies that are no form or too large.
  explicit Request(const std::vector<std::string>& methods);

  bool isPost() const { return post_; }

  // Value of a parameter, "" if it is absent, as RFC 6749, section 3.1, treats the two alike. A
  // parameter that was sent twice, is too long or holds control characters counts as absent.
  std::string get(const std::string& name) const;

  // Refuses the request if get() hides anything.
  void requireSoundParameters() const;

  // All cookies of that name: a browser may send several.
  std::vector<std::string> cookies(const std::string& name) const;

  // Value of the header Authorization, "" if it is absent.
  static std::string authorization();

 private:
  void read();

  bool post_ = false;
  std::map<std::string, std::string> parameters_;
  std::string problem_;  // with the first unsound parameter
  std::vector<std::pair<std::string, std::string>> cookies_;
};

}  // namespace authserver
