// Something that a check found.

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
