// A problem that a check found, and what to do about it.

#pragma once

#include <string>
#include <vector>

namespace oauthctl {

struct Finding {
  std::string problem;
  std::string advice;
};
using Findings = std::vector<Finding>;

}  // namespace oauthctl
