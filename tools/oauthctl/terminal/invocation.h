// What the operator asked for: the values of one command's operands and options, by their names in
// the table of commands.

#pragma once

#include <map>
#include <string>
#include <utility>

namespace oauthctl {

class Invocation {
 public:
  explicit Invocation(std::map<std::string, std::string> values) : values_(std::move(values)) {}

  bool has(const std::string& name) const { return values_.count(name) != 0; }
  // "" if it was not given; see has().
  std::string value(const std::string& name) const {
    const auto found = values_.find(name);
    return found == values_.end() ? std::string() : found->second;
  }

 private:
  std::map<std::string, std::string> values_;
};

}  // namespace oauthctl
