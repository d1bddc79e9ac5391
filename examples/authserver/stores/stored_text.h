// Values from the rows of the stores.

#pragma once

#include <json/value.h>

#include <cstdint>
#include <string>

namespace authserver {

// The text as it was given to the store. A store doubles single quotes before it quotes the value
// for SQL, which doubles them again. So rows hold them doubled, and every text needs this function.
std::string storedText(const Json::Value& row, const char* column);

// A number, which rows hold as decimal text; see fromDecimal().
std::int64_t storedNumber(const Json::Value& row, const char* column);

}  // namespace authserver
