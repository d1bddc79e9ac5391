// GET and POST /authorize: the user logs in and decides, and the client gets a code (RFC 6749,
// section 4.1). Every form sends the authorization request again, and it is checked again.

#include "audit.h"
#include "authorization_request.h"
#include "codes.h"
#include "digest.h"
#include "endpoint.h"
#include "pages.h"
#include "scope.h"
#include "session.h"
#include "users.h"

namespace authserver {
namespace {

FormPage formOf(const AuthorizationRequest& request, const Session& session) {
  return {request.client().name, request.redirectUri(), request.fields(),
          formToken(session, formEncoded(request.fields()))};
}

Response withSession(Response response, const Session& session) {
  for (auto& header : sessionHeaders(session)) response.headers.push_back(std::move(header));
  return response;
}

// The consent page, or the login page if nobody is logged in.
Response nextPage(const AuthorizationRequest& request, const Session& session) {
  const std::optional<User> user = findUser(session.user);
  if (!user) return withSession(loginPage(formOf(request, session), "", false), session);
  std::vector<std::string> wishes;
  for (const std::string& scope : scopesOf(request.scope())) wishes.push_back(meaningOf(scope));
  return consentPage(formOf(request, session), user->displayName, wishes);
}

// Redirects to the same request by GET. The user can reload that page.
Response redirectToRequest(const AuthorizationRequest& request, const Session& session) {
  return withSession(redirection(303, "/authorize?" + formEncoded(request.fields())), session);
}

Response logIn(const Request& http, const AuthorizationRequest& request, const Session& session) {
  const std::string name = http.get("username");
  if (const auto user = checkPassword(name, http.get("password")))
    return redirectToRequest(request, newSession(user->name));
  audit("login failed for " + quotedForLog(name));
  return loginPage(formOf(request, session), name, true);
}

Response allow(const AuthorizationRequest& request, const User& user) {
  const std::string code = issueCode(user.name, request.client().id, request.scope(),
                                     request.redirectUri(), request.challenge());
  audit(quotedForLog(user.name) + " allowed " + quotedForLog(request.client().name) + " " +
        quotedForLog(request.scope()));
  return redirection(303, request.answerUrl({{"code", code}}));
}

Response pressedButton(const Request& http, const AuthorizationRequest& request,
                       const Session& session) {
  const std::string action = http.get("action");
  if (action == "login") return logIn(http, request, session);
  if (action == "switch") return redirectToRequest(request, newSession(""));
  const std::optional<User> user = findUser(session.user);
  if (!user) return nextPage(request, session);
  if (action == "allow") return allow(request, *user);
  if (action == "deny") throw Refusal(400, "access_denied", "The user said no.");
  throw invalidRequest("The form lacks an action.");
}

void checkFormToken(const Request& http, const AuthorizationRequest& request,
                    const Session& session) {
  if (equalSecrets(http.get("csrf"), formToken(session, formEncoded(request.fields())))) return;
  throw Refusal(403, "access_denied",
                "This form is too old, or does not come from this server. Nothing was done.");
}

Response backToClient(const Request& http, const AuthorizationRequest& request,
                      const Refusal& refusal) {
  return redirection(http.isPost() ? 303 : 302, request.answerUrl(refusal));
}

Response answerOf(const Request& http, AuthorizationRequest& request) {
  const Session session = currentSession(http);
  if (http.isPost()) checkFormToken(http, request, session);
  try {
    request.check();
    return http.isPost() ? pressedButton(http, request, session) : nextPage(request, session);
  } catch (const Refusal& refusal) {
    return backToClient(http, request, refusal);
  }
}

Response authorize(const Request& http) {
  AuthorizationRequest request(http);
  try {
    return answerOf(http, request);
  } catch (const Refusal&) {
    throw;
  } catch (const std::exception& error) {  // a redirect has no status of an error
    return backToClient(http, request, serverError(error));
  }
}

}  // namespace
}  // namespace authserver

int main() { return authserver::serve("authorize", authserver::authorize, authserver::errorPage); }
