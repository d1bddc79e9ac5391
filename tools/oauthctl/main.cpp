#include <sys/stat.h>

#include <cstdio>
#include <exception>
#include <string>

#include "command_line/command_line.h"
#include "terminal/escaping.h"
#include "terminal/exit_code.h"

namespace {

int fail(oauthctl::ExitCode code, const std::string& line) {
  std::fflush(stdout);
  std::fprintf(stderr, "oauthctl: %s\n", oauthctl::escaped(line).c_str());
  return static_cast<int>(code);
}

void run(int argc, char** argv) {
  using namespace oauthctl;
  std::string output;
  const auto request = parseCommandLine(argc, argv, output);
  if (request)
    request->command->run(request->invocation);
  else
    std::fputs(output.c_str(), stdout);
  if (std::fflush(stdout) != 0 || std::ferror(stdout) != 0)
    throw Failure(ExitCode::kAttention, "cannot write to standard output");
}

}  // namespace

int main(int argc, char** argv) {
  using oauthctl::ExitCode;
  try {
    umask(077);  // whatever this program makes holds secrets
    oauthctl::useTextEncoding();
    run(argc, argv);
    return static_cast<int>(ExitCode::kFine);
  } catch (const oauthctl::Failure& failure) {
    return fail(failure.code(), failure.what());
  } catch (const std::exception& error) {
    return fail(ExitCode::kAttention, error.what());
  }
}
