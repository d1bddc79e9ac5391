// The output of a command: a table for people, or a JSON document for programs.

#pragma once

#include <json/value.h>

#include <string>
#include <vector>

namespace oauthctl {

struct Column {
  const char* heading;
  bool rightAligned = false;
};

enum class Tone { kPlain, kFaint, kWarning };

// Columns are aligned, and wrapped to the width of a terminal. Cells are escaped.
class Table {
 public:
  explicit Table(std::vector<Column> columns) : columns_(std::move(columns)) {}

  void add(std::vector<std::string> cells, Tone tone = Tone::kPlain) {
    rows_.push_back({std::move(cells), tone});
  }
  // Prints nothing if there is no row.
  void print() const;

 private:
  struct Row {
    std::vector<std::string> cells;
    Tone tone;
  };
  std::vector<Column> columns_;
  std::vector<Row> rows_;
};

// Prints pairs of a name and a value, one on each line.
void printPairs(const std::vector<std::pair<std::string, std::string>>& pairs);

// Prints the document as valid JSON in printable ASCII, whatever bytes its values have.
void printJson(const Json::Value& document);

}  // namespace oauthctl
