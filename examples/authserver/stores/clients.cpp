#include "clients.h"

#include "oauth_clientInfo.h"
#include "store_errors.h"
#include "stored_text.h"

namespace authserver {

std::optional<Client> findClient(const std::string& id) {
  ZEVOOAUTHSERVER::OAUTHDBClientInfo store("oauth_clientInfo");
  requireOpen(store);
  Json::Value rows;
  if (!attempt(store, [&] { return store.Get(id, &rows); }) || rows.empty()) return std::nullopt;
  const Json::Value& row = rows[0U];
  if (storedText(row, "enable") != "1") return std::nullopt;
  return Client{storedText(row, "client_id"), storedText(row, "client_secret"),
                storedText(row, "redirect_uri"), storedText(row, "scope"),
                storedText(row, "display_name")};
}

}  // namespace authserver
