// The pages that people see.

#pragma once

#include <string>
#include <vector>

#include "form_encoding.h"
#include "http_response.h"
#include "refusal.h"

namespace authserver {

// What the login page and the consent page have in common.
struct FormPage {
  std::string clientName;
  std::string redirectUri;
  Fields request;         // a hidden field for each
  std::string formToken;  // a hidden field
};

// user is the value of the name field. failed is true after a wrong name or password.
Response loginPage(const FormPage& form, const std::string& user, bool failed);

// wishes are the scopes that the client asks for, in words.
Response consentPage(const FormPage& form, const std::string& user,
                     const std::vector<std::string>& wishes);

Response errorPage(const Refusal& refusal);

}  // namespace authserver
