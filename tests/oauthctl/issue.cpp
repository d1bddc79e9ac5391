// Acts as the server in the session of docs/oauthctl.md: issues a code or a token to the first
// client. It expires after the given number of seconds.
//
//   oauthctl_issue code USER SECONDS CODE
//   oauthctl_issue token USER SECONDS ACCESS_TOKEN REFRESH_TOKEN

#include <cstdlib>
#include <iostream>
#include <string>

#include "oauth_clientInfo.h"
#include "oauth_grantCode.h"
#include "oauth_names.h"
#include "oauth_token.h"
#include "utils/unix_time.h"

using namespace ZEVOOAUTHSERVER;

int main(int argc, char** argv) {
  if (argc < 5) {
    std::cerr << "usage: oauthctl_issue code|token USER SECONDS SECRET...\n";
    return 2;
  }
  Json::Value clients, issued;
  OAUTHDBClientInfo(names::table::kClientInfo).Get(&clients);
  const std::string client = clients[0U]["client_id"].asString(), user = argv[2];
  const std::string expiry = std::to_string(unixNow() + std::atoll(argv[3]));
  OAUTHDBGrantCode codes(names::table::kGrantCode);
  OAUTHDBToken tokens(names::table::kToken);
  const int done =
      argc == 5 ? codes.Add(user, client, "read", argv[4], expiry, "xyz", "192.0.2.7", issued)
                : tokens.Add(user, client, "read", argv[5], argv[4], expiry, "code", "xyz",
                             "192.0.2.7", issued);
  return done != 0 ? 0 : 1;
}
