// A row of a result as a document: {"<column>": string, ...}.

#pragma once

#include <json/value.h>

#include <algorithm>
#include <array>
#include <cstddef>
#include <cstring>
#include <initializer_list>
#include <vector>

#include "oauth_names.h"

namespace ZEVOOAUTHSERVER {

// An SQL NULL reads as the empty text.
inline const char* textOrEmpty(const char* text) { return text == nullptr ? "" : text; }

// A row of one table without its values. Copying it is much cheaper than adding member by member,
// and the copies share the columns' names.
class RowForm {
 public:
  // The names must live as long as any row. The library's constants do: the library stays in memory
  // even after dlclose().
  RowForm(std::initializer_list<const char*> columns) : columns_(columns) {
    for (const char* const column : columns_) empty_[Json::StaticString(column)];
    for (const std::string& member : empty_.getMemberNames())
      order_.push_back(std::find(columns_.begin(), columns_.end(), member) - columns_.begin());
  }

  bool fits(int columns, char** columnNames) const {
    return std::equal(columns_.begin(), columns_.end(), columnNames, columnNames + columns,
                      [](const char* a, const char* b) { return std::strcmp(a, b) == 0; });
  }

  Json::Value withValues(char** values) const {
    Json::Value row = empty_;
    auto column = order_.begin();
    for (Json::Value& member : row) member = textOrEmpty(values[*column++]);
    return row;
  }

 private:
  std::vector<const char*> columns_;
  Json::Value empty_;
  std::vector<std::ptrdiff_t> order_;  // for each member, which column it is
};

// Rows of known tables are copied from a form; others are built member by member.
inline Json::Value makeRow(int columns, char** values, char** columnNames) {
  namespace column = names::column;
  // Constant, and never destroyed: programs read rows in exit handlers too.
  static const auto& forms = *new const std::array<RowForm, 4>{{
      {column::kUserName, column::kClientId, column::kScope, column::kRefreshToken,
       column::kAccessToken, column::kExpiredTime, column::kFlowType, column::kState, column::kIp,
       column::kId},
      {column::kUserName, column::kClientId, column::kScope, column::kCode, column::kExpiredTime,
       column::kState, column::kIp, column::kId},
      {column::kEnable, column::kClientId, column::kClientSecret, column::kRedirectUri,
       column::kScope, column::kDisplayName, column::kId},
      {column::kTimestamp, column::kMsg, column::kId},
  }};
  for (const RowForm& form : forms)
    if (form.fits(columns, columnNames)) return form.withValues(values);
  Json::Value row;
  for (int i = 0; i < columns; ++i) row[columnNames[i]] = textOrEmpty(values[i]);
  return row;
}

}  // namespace ZEVOOAUTHSERVER
