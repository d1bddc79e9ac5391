#include "endpoint.h"

#include <sodium.h>
#include <sys/stat.h>

#include <iostream>

namespace authserver {

Refusal serverError(const std::exception& error) {
  std::cerr << std::string("authserver: ") + error.what() + '\n';
  return {500, "server_error", "Something went wrong on the server."};
}

int serve(const std::vector<std::string>& methods, Response (*answer)(const Request& request),
          Response (*explain)(const Refusal& refusal)) {
  try {
    umask(S_IRWXG | S_IRWXO);  // for the database, should this be its first use
    if (sodium_init() < 0) throw std::runtime_error("no randomness");
    try {
      send(answer(Request(methods)));
    } catch (const Refusal& refusal) {
      send(explain(refusal));
    }
    return 0;
  } catch (const std::exception& failure) {
    const Refusal refusal = serverError(failure);
    try {
      send(explain(refusal));
    } catch (const std::exception& error) {  // the web server says so then
      std::cerr << std::string("authserver: and no answer: ") + error.what() + '\n';
    }
    return 1;
  }
}

}  // namespace authserver
