// Prints one of the files that are made from the table of commands:
//
//   oauthctl_documents completion > tools/oauthctl/oauthctl.bash
//   oauthctl_documents manual > tools/oauthctl/oauthctl.1

#include <cstdio>
#include <string>

#include "documents.h"

int main(int argc, char** argv) {
  const std::string wanted = argc == 2 ? argv[1] : "";
  if (wanted == "completion") return std::fputs(oauthctl::bashCompletion().c_str(), stdout) < 0;
  if (wanted == "manual") return std::fputs(oauthctl::manualPage().c_str(), stdout) < 0;
  std::fputs("usage: oauthctl_documents completion|manual\n", stderr);
  return 2;
}
