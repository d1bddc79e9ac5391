// The answer as the web server expects it (RFC 3875).

#pragma once

#include <json/value.h>

#include <string>

#include "refusal.h"

namespace authserver {

struct Response {
  int status = 200;
  Headers headers;
  std::string body;
};

Response jsonResponse(int status, const Json::Value& document, Headers headers = {});
Response redirection(int status, const std::string& target, Headers headers = {});

// A refusal as the document of RFC 6749, section 5.2.
Response jsonRefusal(const Refusal& refusal);

// Writes the answer to standard output, with what holds for all of them: nothing is stored,
// nothing is guessed about content, nothing is loaded, framed or told to others.
void send(const Response& response);

}  // namespace authserver
