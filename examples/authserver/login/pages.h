// The pages that people see.

#pragma once

#include <string>
#include <vector>

#include "form_encoding.h"
#include "http_response.h"
#include "refusal.h"

namespace authserver {

// What login and consent page have in common.
struct FormPage {
  std::string clientName;
  std::string redirectUri;
  Fields request;         // sent along again, hidden
  std::string formToken;  // likewise
};

// user: what to fill in. failed: whether the last try was wrong.
Response loginPage(const FormPage& form, const std::string& user, bool failed);
// wishes: what the client asks for, in words.
Response consentPage(const FormPage& form, const std::string& user,
                     const std::vector<std::string>& wishes);
Response errorPage(const Refusal& refusal);

}  // namespace authserver
