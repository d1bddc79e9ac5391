#include "endpoint.h"

#include <sodium.h>
#include <sys/stat.h>

#include <iostream>

#include "endpoints.h"

namespace authserver {
namespace {

const std::vector<std::string>& methodsOf(const std::string& program) {
  for (const Endpoint& endpoint : endpoints())
    if (endpoint.program == program) return endpoint.methods;
  throw std::runtime_error("endpoints.txt has no program " + program);
}

}  // namespace

Refusal serverError(const std::exception& error) {
  std::cerr << std::string("authserver: ") + error.what() + '\n';
  return {500, "server_error", "Something went wrong on the server."};
}

int serve(const std::string& program, Response (*answer)(const Request& request),
          Response (*explain)(const Refusal& refusal)) {
  try {
    umask(S_IRWXG | S_IRWXO);  // the first request makes the database
    if (sodium_init() < 0) throw std::runtime_error("no randomness");
    try {
      send(answer(Request(methodsOf(program))));
    } catch (const Refusal& refusal) {
      send(explain(refusal));
    }
    return 0;
  } catch (const std::exception& failure) {
    const Refusal refusal = serverError(failure);
    try {
      send(explain(refusal));
    } catch (const std::exception& error) {  // the web server answers with an error
      std::cerr << std::string("authserver: and no answer: ") + error.what() + '\n';
    }
    return 1;
  }
}

}  // namespace authserver
