#include "terminal/table_output.h"

#include <json/writer.h>
#include <libsmartcols.h>
#include <unistd.h>

#include <algorithm>
#include <cstdio>
#include <memory>
#include <new>

#include "terminal/escaping.h"
#include "terminal/terminal.h"

namespace oauthctl {
namespace {

struct FreeTable {
  void operator()(libscols_table* table) const { scols_unref_table(table); }
};

template <class T>
T* orBadAlloc(T* object) {
  if (object == nullptr) throw std::bad_alloc();
  return object;
}

const char* colourOf(Tone tone) {
  switch (tone) {
    case Tone::kFaint:
      return "\x1b[2m";
    case Tone::kWarning:
      return "\x1b[33m";
    default:
      return nullptr;
  }
}

// The writer would make another letter of some invalid bytes.
Json::Value withValidTexts(const Json::Value& document) {
  if (document.isString()) return validUtf8(document.asString());
  Json::Value result = document;
  if (document.isArray())
    for (Json::Value& element : result) element = withValidTexts(element);
  if (!document.isObject()) return result;
  result = Json::Value(Json::objectValue);
  for (const std::string& name : document.getMemberNames())
    result[validUtf8(name)] = withValidTexts(document[name]);
  return result;
}

std::string cellText(const std::string& text) { return text.empty() ? "-" : escaped(text); }

}  // namespace

void Table::print() const {
  if (rows_.empty()) return;
  const std::unique_ptr<libscols_table, FreeTable> table(orBadAlloc(scols_new_table()));
  scols_table_enable_colors(table.get(),
                            isatty(STDOUT_FILENO) != 0 && takesEscapeSequences() ? 1 : 0);
  // Cells are escaped already.
  scols_table_enable_noencoding(table.get(), 1);
  bool headings = false;
  for (const Column& column : columns_) {
    headings |= *column.heading != '\0';
    const int flags = column.rightAligned ? SCOLS_FL_RIGHT : SCOLS_FL_WRAP;
    libscols_column* const added =
        orBadAlloc(scols_table_new_column(table.get(), column.heading, 0, flags));
    scols_cell_set_color(scols_column_get_header(added), "\x1b[1m");
  }
  scols_table_enable_noheadings(table.get(), headings ? 0 : 1);
  for (const Row& row : rows_) {
    libscols_line* const line = orBadAlloc(scols_table_new_line(table.get(), nullptr));
    if (const char* const colour = colourOf(row.tone)) scols_line_set_color(line, colour);
    for (std::size_t i = 0; i < row.cells.size(); ++i)
      if (scols_line_set_data(line, i, cellText(row.cells[i]).c_str()) != 0) throw std::bad_alloc();
  }
  scols_print_table(table.get());
}

void printPairs(const std::vector<std::pair<std::string, std::string>>& pairs) {
  Table table({{""}, {""}});
  for (const auto& [name, value] : pairs) table.add({name, value});
  table.print();
}

void printJson(const Json::Value& document) {
  Json::StreamWriterBuilder builder;
  builder["indentation"] = "  ";
  builder["enableYAMLCompatibility"] = true;  // "key": value
  std::string text = Json::writeString(builder, withValidTexts(document));
  // The writer escapes every other control character.
  for (std::size_t at = 0; (at = text.find('\x7f', at)) != std::string::npos;)
    text.replace(at, 1, "\\u007f");
  std::printf("%s\n", text.c_str());
}

}  // namespace oauthctl
