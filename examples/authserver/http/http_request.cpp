#include "http_request.h"

#include <cgicc/Cgicc.h>
#include <strings.h>

#include <algorithm>
#include <cctype>
#include <cstdlib>
#include <set>

#include "control_characters.h"
#include "joined.h"
#include "refusal.h"

namespace authserver {
namespace {

constexpr std::size_t kLongestName = 64, kLongestValue = 4096;  // bytes
constexpr std::size_t kMostParameters = 100;
constexpr std::size_t kLargestBody = 65536;  // bytes
constexpr char kForm[] = "application/x-www-form-urlencoded";

std::string variable(const char* name) {
  const char* const value = std::getenv(name);
  return value == nullptr ? "" : value;
}

// Runs before anything is parsed: a body that is not a form never reaches the parser.
void checkBody() {
  std::string type = variable("CONTENT_TYPE");
  type = type.substr(0, type.find_first_of("; "));
  std::transform(type.begin(), type.end(), type.begin(),
                 [](unsigned char c) { return static_cast<char>(std::tolower(c)); });
  if (type != kForm) throw invalidRequest(std::string("The body must be of type ") + kForm + ".");
  // The leading digits count: whatever follows them, a large number is refused before it is read.
  if (std::strtoul(variable("CONTENT_LENGTH").c_str(), nullptr, 10) > kLargestBody)
    throw Refusal(413, "invalid_request", "The body is too large.");
  // The parser would mix them with those of the form, and log files show queries.
  if (!variable("QUERY_STRING").empty())
    throw invalidRequest("Parameters must be in the body, not in the query.");
}

}  // namespace

Request::Request(const std::vector<std::string>& methods) {
  const std::string method = variable("REQUEST_METHOD");
  if (std::find(methods.begin(), methods.end(), method == "HEAD" ? "GET" : method) == methods.end())
    throw Refusal(405, "invalid_request", "This method is not allowed here.",
                  {{"Allow", joined(methods, ", ")}});
  post_ = method == "POST";
  if (post_) checkBody();
  read();
}

void Request::read() try {
  const cgicc::Cgicc cgi;
  if (cgi.getElements().size() > kMostParameters) throw invalidRequest("Too many parameters.");
  std::set<std::string> unsound;
  for (const cgicc::FormEntry& entry : cgi.getElements()) {
    const std::string name = entry.getName(), value = entry.getValue();
    if (name.size() > kLongestName || value.size() > kLongestValue)
      problem_ = "A parameter is too long.";
    else if (hasControlCharacters(name + value))
      problem_ = "A parameter holds control characters.";
    else if (parameters_.emplace(name, value).second)
      continue;
    else
      problem_ = "A parameter was sent more than once.";
    unsound.insert(name);
  }
  for (const std::string& name : unsound) parameters_.erase(name);
  for (const cgicc::HTTPCookie& cookie : cgi.getEnvironment().getCookieList())
    cookies_.emplace_back(cookie.getName(), cookie.getValue());
} catch (const Refusal&) {
  throw;
} catch (const std::exception&) {  // only the request can make the parser fail
  throw invalidRequest("The request cannot be read.");
}

std::string Request::get(const std::string& name) const {
  const auto found = parameters_.find(name);
  return found == parameters_.end() ? "" : found->second;
}

std::string Request::required(const std::string& name) const {
  std::string value = get(name);
  if (value.empty()) throw invalidRequest(name + " is missing.");
  return value;
}

void Request::requireSoundParameters() const {
  if (!problem_.empty()) throw invalidRequest(problem_);
}

std::vector<std::string> Request::cookies(const std::string& name) const {
  std::vector<std::string> values;
  for (const auto& [cookieName, value] : cookies_)
    if (cookieName == name) values.push_back(value);
  return values;
}

std::string Request::authorization() { return variable("HTTP_AUTHORIZATION"); }

std::optional<std::string> Request::credentials(const std::string& scheme) {
  const std::string header = authorization(), start = scheme + ' ';
  if (strncasecmp(header.c_str(), start.c_str(), start.size()) != 0) return std::nullopt;
  return header.substr(start.size());
}

}  // namespace authserver
