#include "authorization_request.h"

#include "configuration.h"
#include "digest.h"
#include "redirect_uri.h"
#include "scope.h"

namespace authserver {
namespace {

constexpr const char* kParameters[] = {
    "response_type", "client_id",      "redirect_uri",         "scope",
    "state",         "code_challenge", "code_challenge_method"};

Client knownClient(const std::string& id) {
  if (const auto client = findClient(id)) return *client;
  throw invalidRequest("This application is not known here.");
}

void checkChallenge(const std::string& challenge, const std::string& method) {
  if (challenge.empty() && method.empty()) return;
  if (method != "S256") throw invalidRequest("The code_challenge_method must be S256.");
  constexpr std::size_t kDigestBytes = 32;
  if (fromBase64url(challenge).size() != kDigestBytes)
    throw invalidRequest("The code_challenge is no SHA-256 digest in base64url.");
}

}  // namespace

AuthorizationRequest::AuthorizationRequest(const Request& http)
    : http_(http),
      client_(knownClient(http.get("client_id"))),
      redirectUri_(http.get("redirect_uri")),
      challenge_(http.get("code_challenge")) {
  if (!isRegistered(redirectUri_, client_.redirectUri))
    throw invalidRequest("The address to go back to does not belong to this application.");
  for (const char* const name : kParameters)
    if (const std::string value = http.get(name); !value.empty()) fields_.emplace_back(name, value);
}

void AuthorizationRequest::check() {
  http_.requireSoundParameters();
  const std::string type = http_.get("response_type");
  if (type.empty()) throw invalidRequest("The response_type is missing.");
  if (type != "code")
    throw Refusal(400, "unsupported_response_type", "The response_type must be code.");
  checkChallenge(challenge_, http_.get("code_challenge_method"));
  scope_ = grantable(http_.get("scope"), client_.scope);
}

std::string AuthorizationRequest::answerUrl(Fields answer) const {
  if (const std::string state = http_.get("state"); !state.empty())
    answer.emplace_back("state", state);
  answer.emplace_back("iss", issuer());
  const char* const separator = redirectUri_.find('?') == std::string::npos ? "?" : "&";
  return redirectUri_ + separator + formEncoded(answer);
}

std::string AuthorizationRequest::answerUrl(const Refusal& refusal) const {
  return answerUrl({{"error", refusal.error}, {"error_description", refusal.what()}});
}

}  // namespace authserver
