#include "http_response.h"

#include <json/writer.h>

#include <algorithm>
#include <iostream>

#include "control_characters.h"

namespace authserver {
namespace {

const Headers kDefaultHeaders = {
    {"Cache-Control", "no-store"},
    {"Pragma", "no-cache"},
    {"X-Content-Type-Options", "nosniff"},
    {"Referrer-Policy", "no-referrer"},
    {"Content-Security-Policy", "default-src 'none'; base-uri 'none'; frame-ancestors 'none'"},
};

bool has(const Headers& headers, const std::string& name) {
  return std::any_of(headers.begin(), headers.end(),
                     [&](const auto& header) { return header.first == name; });
}

void write(std::ostream& out, const Headers& headers) {
  for (const auto& [name, value] : headers) out << name << ": " << value << "\r\n";
}

// With a line break in a value, whoever chose the value could add headers.
void check(const Headers& headers) {
  for (const auto& [name, value] : headers)
    if (hasControlCharacters(value)) throw std::logic_error("control character in header " + name);
}

}  // namespace

Response jsonResponse(int status, const Json::Value& document, Headers headers) {
  Json::StreamWriterBuilder writer;
  writer["indentation"] = "";
  headers.emplace_back("Content-Type", "application/json");
  return {status, std::move(headers), Json::writeString(writer, document) + '\n'};
}

Response redirection(int status, const std::string& target, Headers headers) {
  headers.emplace_back("Location", target);
  return {status, std::move(headers), ""};
}

Response jsonRefusal(const Refusal& refusal) {
  Json::Value document;
  document["error"] = refusal.error;
  document["error_description"] = refusal.what();
  return jsonResponse(refusal.status, document, refusal.headers);
}

void send(const Response& response) {
  check(response.headers);
  std::cout << "Status: " << response.status << "\r\n";
  write(std::cout, response.headers);
  for (const auto& header : kDefaultHeaders)
    if (!has(response.headers, header.first)) write(std::cout, {header});
  std::cout << "\r\n" << response.body << std::flush;
}

}  // namespace authserver
