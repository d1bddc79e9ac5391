#include "stored_text.h"

#include "decimal_text.h"

namespace authserver {

std::string storedText(const Json::Value& row, const char* column) {
  std::string text = row[column].asString();
  for (std::size_t at = 0; (at = text.find("''", at)) != std::string::npos; ++at) text.erase(at, 1);
  return text;
}

std::int64_t storedNumber(const Json::Value& row, const char* column) {
  return fromDecimal(row[column].asString());
}

}  // namespace authserver
