// Prints a file that is made from the table of commands. In the folder tools/oauthctl:
//
//   oauthctl_documents completion > oauthctl.bash
//   oauthctl_documents manual < oauthctl.1.in > oauthctl.1

#include <cstdio>
#include <iostream>
#include <iterator>
#include <string>

#include "command_line/documents.h"

int main(int argc, char** argv) {
  const std::string wanted = argc == 2 ? argv[1] : "";
  if (wanted == "completion") {
    std::cout << oauthctl::bashCompletion();
  } else if (wanted == "manual") {
    const std::istreambuf_iterator<char> begin(std::cin), end;
    std::cout << oauthctl::manualPage({begin, end});
  } else {
    std::cerr << "usage: oauthctl_documents completion|manual\n";
    return 2;
  }
  return std::cout.flush() ? 0 : 1;
}
