#include <algorithm>
#include <cctype>

#include "commands/commands.h"
#include "database/database.h"
#include "decimal_text.h"
#include "oauth_log.h"
#include "terminal/exit_code.h"
#include "terminal/human_time.h"
#include "terminal/table_output.h"
#include "terminal/terminal.h"

namespace oauthctl {

using ZEVOOAUTHSERVER::decimalNumber;
using ZEVOOAUTHSERVER::OAUTHDBLog;

namespace column = names::column;

namespace {

std::string lowerCase(std::string text) {
  for (char& c : text) c = static_cast<char>(std::tolower(static_cast<unsigned char>(c)));
  return text;
}

// Ignores case. Unlike in the library's search, % and _ are ordinary characters.
bool contains(const std::string& message, const std::string& text) {
  return lowerCase(message).find(lowerCase(text)) != std::string::npos;
}

// How many of the newest lines to show: all of them, unless the operator gives a number.
std::size_t lineCount(const Invocation& invocation, std::size_t all) {
  if (!invocation.has("--last")) return all;
  const std::string text = invocation.value("--last");
  const auto wanted = decimalNumber(text);
  if (!wanted || *wanted < 1)
    throw Failure(ExitCode::kUsage, "'" + text + "' is no number of lines: give 1 or more");
  return static_cast<std::size_t>(std::min<std::int64_t>(*wanted, static_cast<long long>(all)));
}

Json::Value matchingLines(const std::string& text) {
  requireDatabase(Access::kRead);
  OAUTHDBLog log(names::table::kLog);
  requireReady(log);
  Json::Value rows, lines(Json::arrayValue);
  attempt(log, "read the audit log",
          [&] { return log.Get("", "ORDER BY timestamp, id", &rows) != 0; });
  for (const Json::Value& row : rows) {
    Json::Value line;
    line["id"] = idValue(row);
    line["timestamp"] =
        static_cast<Json::Int64>(decimalNumber(row[column::kTimestamp].asString()).value_or(0));
    line["msg"] = originalText(row[column::kMsg].asString());
    if (contains(line["msg"].asString(), text)) lines.append(line);
  }
  return lines;
}

}  // namespace

void showLog(const Invocation& invocation) {
  lineCount(invocation, 1);  // reports a wrong --last before anything else
  const Json::Value all = matchingLines(invocation.value("--match"));
  Json::Value lines(Json::arrayValue);
  const auto wanted = static_cast<Json::ArrayIndex>(lineCount(invocation, all.size()));
  for (Json::ArrayIndex i = all.size() - wanted; i < all.size(); ++i) lines.append(all[i]);
  if (invocation.has("--json")) {
    printJson(lines);
  } else {
    Table table({{"TIME"}, {"MESSAGE"}});
    for (const Json::Value& line : lines)
      table.add({localTime(line["timestamp"].asInt64()), line["msg"].asString()});
    table.print();
  }
  if (!lines.empty()) return;
  if (invocation.has("--match"))
    throw Failure(ExitCode::kAttention,
                  "no line of the audit log contains '" + invocation.value("--match") + "'");
  if (!invocation.has("--json")) say("no lines");
}

void clearLog(const Invocation& invocation) {
  Database database(Access::kWrite);
  const int lines = database.rowCount(names::table::kLog);
  if (lines == 0) {
    say("nothing to delete: the audit log is empty");
    return;
  }
  confirm(invocation, "Delete all " + std::to_string(lines) + " lines of the audit log?");
  OAUTHDBLog log(names::table::kLog);
  requireReady(log);
  attempt(log, "clear the audit log", [&] { return log.Del() != 0; });
  say("deleted " + std::to_string(lines) + " lines");
}

}  // namespace oauthctl
