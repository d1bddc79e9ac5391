#include <iostream>

#include "oauth_token.h"
#include "oauth_utils.h"

int main() {  // touches no file: the library's are the machine's own
  char column[] = "username", value[] = "alice";
  char* columns[] = {column};
  char* values[] = {value};
  Json::Value rows;
  ZEVOOAUTHSERVER::OAUTHDBToken::TabGetCallback(&rows, 1, values, columns);
  std::cout << rows[0U]["username"].asString() << ' ' << ZEVOOAUTHSERVER::getRandomStr(64).size()
            << '\n';
}
