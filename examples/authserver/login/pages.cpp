#include "pages.h"

#include <ctemplate/template.h>

#include <cstdlib>
#include <stdexcept>

#include "redirect_uri.h"

namespace authserver {
namespace {

Response pageOf(int status, const std::string& name, ctemplate::TemplateDictionary& values,
                const std::string& formTargets) {
  const char* const folder = std::getenv("AUTHSERVER_TEMPLATES");
  if (folder == nullptr) throw std::runtime_error("AUTHSERVER_TEMPLATES is not set");
  ctemplate::Template::SetTemplateRootDirectory(folder);
  values.AddIncludeDictionary("HEAD")->SetFilename("head.tpl");
  Response page{status,
                {{"Content-Type", "text/html; charset=utf-8"},
                 {"Content-Security-Policy",
                  "default-src 'none'; style-src 'self'; base-uri 'none'; frame-ancestors 'none'; "
                  "form-action " +
                      formTargets}},
                ""};
  if (!ctemplate::ExpandTemplate(name, ctemplate::STRIP_BLANK_LINES, &values, &page.body))
    throw std::runtime_error("cannot fill in " + name);
  return page;
}

// A browser applies the policy to the redirect after the form, too.
std::string targetsOf(const FormPage& form) { return "'self' " + policySourceOf(form.redirectUri); }

void fill(ctemplate::TemplateDictionary& values, const FormPage& form) {
  values.SetValue("CLIENT", form.clientName);
  values.SetValue("DESTINATION", destinationOf(form.redirectUri));
  values.SetValue("FORM_TOKEN", form.formToken);
  for (const auto& [name, value] : form.request) {
    ctemplate::TemplateDictionary* const field = values.AddSectionDictionary("FIELD");
    field->SetValue("NAME", name);
    field->SetValue("VALUE", value);
  }
}

}  // namespace

Response loginPage(const FormPage& form, const std::string& user, bool failed) {
  ctemplate::TemplateDictionary values("login");
  fill(values, form);
  values.SetValue("USER", user);
  if (failed) {
    values.ShowSection("FAILED");
    values.ShowSection("MARKED");
  }
  return pageOf(200, "login.tpl", values, targetsOf(form));
}

Response consentPage(const FormPage& form, const std::string& user,
                     const std::vector<std::string>& wishes) {
  ctemplate::TemplateDictionary values("consent");
  fill(values, form);
  values.SetValue("USER", user);
  for (const std::string& wish : wishes)
    values.AddSectionDictionary("WISH")->SetValue("WORDS", wish);
  return pageOf(200, "consent.tpl", values, targetsOf(form));
}

Response errorPage(const Refusal& refusal) {
  ctemplate::TemplateDictionary values("error");
  values.SetValue("REASON", refusal.what());
  values.SetValue("CODE", refusal.error);
  Response page = pageOf(refusal.status, "error.tpl", values, "'none'");
  page.headers.insert(page.headers.end(), refusal.headers.begin(), refusal.headers.end());
  return page;
}

}  // namespace authserver
