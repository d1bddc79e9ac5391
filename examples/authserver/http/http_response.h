// The answer in the form that the web server expects (RFC 3875).

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

// Writes the answer to standard output. Unless the answer has these headers itself, adds those that
// forbid a browser to store it, guess its type, load other content, frame it or send a referrer.
void send(const Response& response);

}  // namespace authserver
