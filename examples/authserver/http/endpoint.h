// The frame of every program: read one request, answer it, and let nothing else out.

#pragma once

#include <string>
#include <vector>

#include "http_request.h"
#include "http_response.h"

namespace authserver {

// What the outside is told of a failure of our own, whose reason goes to standard error.
Refusal serverError(const std::exception& error);

// The result is the program's exit status. explain makes the answer for a refusal, and for a
// failure of our own.
int serve(const std::vector<std::string>& methods, Response (*answer)(const Request& request),
          Response (*explain)(const Refusal& refusal));

}  // namespace authserver
