#include <iostream>

#include "oauth_token.h"
#include "oauth_utils.h"

int main() {  // touches no file: the library's are the machine's own
  Json::Value condition;
  condition["username"] = "alice";
  std::cout << ZEVOOAUTHSERVER::OAUTHDBToken::GetConditionParam(condition) << ' '
            << ZEVOOAUTHSERVER::getRandomStr(64).size() << '\n';
}
