// What every program does: it reads one request and sends one answer. No exception leaves it.

#pragma once

#include <exception>
#include <string>

#include "http_request.h"
#include "http_response.h"

namespace authserver {

// The refusal for an error of the server itself. Only standard error gets the reason.
Refusal serverError(const std::exception& error);

// Returns the program's exit status. program is its name in endpoints.txt. explain makes the answer
// for a refusal and for an error of the server itself.
int serve(const std::string& program, Response (*answer)(const Request& request),
          Response (*explain)(const Refusal& refusal));

}  // namespace authserver
