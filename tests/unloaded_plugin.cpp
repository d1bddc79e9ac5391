// A plug-in that returns a row that the library has made.

#include <json/value.h>

#include "oauth_db_basic.h"

extern "C" void readRow(Json::Value* rows) {
  char timestamp[] = "timestamp", msg[] = "msg", id[] = "id";
  char time[] = "1700000000", text[] = "hello", number[] = "1";
  char* columns[] = {timestamp, msg, id};
  char* values[] = {time, text, number};
  ZEVOOAUTHSERVER::OAUTHDBBasic::TabGetCallback(rows, 3, values, columns);
}
