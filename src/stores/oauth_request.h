// What every store does with its arguments: it checks lengths, builds requests, reads row ids.

#pragma once

#include <json/value.h>

#include <initializer_list>
#include <string>

#include "decimal_text.h"
#include "oauth_names.h"
#include "oauth_utils.h"

namespace ZEVOOAUTHSERVER {

// One value of an operation, with its column and its length limit.
struct Field {
  const char* column;
  const std::string& value;
  names::Limit limit;
  bool isQuoted;
};
// A list of them is all that an operation says about its values: it is checked, and then becomes
// the record or the changes. The order is that of the checks.
using Fields = std::initializer_list<Field>;

// The value's single quotes are doubled, once more than SQL needs: they are stored doubled.
inline Field quoted(const char* column, const std::string& value, names::Limit limit) {
  return {column, value, limit, true};
}
// The value is stored as it is.
inline Field asGiven(const char* column, const std::string& value, names::Limit limit) {
  return {column, value, limit, false};
}

// Checks the lengths in order and stops at the first that does not fit.
inline bool fit(Fields fields) {
  for (const Field& field : fields)
    if (!checkStrLen(field.value, field.limit.min, field.limit.max, false)) return false;
  return true;
}

inline std::string storedText(const Field& field) {
  return field.isQuoted ? getSQLFormatStr(field.value) : field.value;
}

// The record of a new row. SQLite fills in the id.
inline Json::Value newRow(Fields fields) {
  Json::Value record;
  for (const Field& field : fields) record[field.column] = storedText(field);
  record[names::column::kId] = Json::nullValue;
  return record;
}

// The request that finds the rows with this value.
inline Json::Value where(const Field& field) {
  Json::Value request;
  request[names::request::kCondition][field.column] = storedText(field);
  return request;
}

inline Json::Value whereId(long long id) {
  Json::Value request;
  request[names::request::kCondition][names::column::kId] = static_cast<Json::Int64>(id);
  return request;
}

// The request that writes the fields into one row.
inline Json::Value changeOf(long long id, Fields fields) {
  Json::Value request = whereId(id);
  Json::Value& modified = request[names::request::kModified];
  for (const Field& field : fields) modified[field.column] = storedText(field);
  return request;
}

// Row id of the first row, its low 32 bits; 0 if there is none.
inline int firstId(const Json::Value& rows) {
  if (rows.empty()) return 0;
  return static_cast<int>(decimalValue(rows[0U][names::column::kId]));
}

}  // namespace ZEVOOAUTHSERVER
