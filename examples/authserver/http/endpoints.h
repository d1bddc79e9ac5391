// The list of this server's endpoints, which the build makes from endpoints.txt.

#pragma once

#include <string>
#include <vector>

namespace authserver {

struct Endpoint {
  std::string program, path;
  std::vector<std::string> methods;
  std::string metadataName;  // its name in the metadata document, "" if it is not in there
  bool clientAuthenticates;
};

const std::vector<Endpoint>& endpoints();

}  // namespace authserver
