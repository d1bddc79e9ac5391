#include "require.h"

#include <cstdio>
#include <cstdlib>

void finding(const std::string& text) {
  std::fprintf(stderr, "does not hold: %s\n", text.c_str());
  std::abort();
}
