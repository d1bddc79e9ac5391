#include <algorithm>
#include <cctype>

#include "commands.h"
#include "database.h"
#include "exit_code.h"
#include "human_time.h"
#include "oauth_log.h"
#include "table_output.h"
#include "terminal.h"

namespace oauthctl {

using ZEVOOAUTHSERVER::OAUTHDBLog;

namespace {

std::string lowered(std::string text) {
  for (char& c : text) c = static_cast<char>(std::tolower(static_cast<unsigned char>(c)));
  return text;
}

// Literally, unlike the library's search, for which % and _ are wildcards.
bool contains(const std::string& message, const std::string& text) {
  return lowered(message).find(lowered(text)) != std::string::npos;
}

// How many lines to show, the newest; all of them unless the operator says.
std::size_t wantedLines(const Invocation& invocation, std::size_t all) {
  if (!invocation.has("--last")) return all;
  const std::string text = invocation.value("--last");
  const auto wanted = number(text);
  if (!wanted || *wanted < 1)
    throw Failure(ExitCode::kUsage, "'" + text + "' is no number of lines: give 1 or more");
  return static_cast<std::size_t>(std::min<std::int64_t>(*wanted, static_cast<long long>(all)));
}

Json::Value matchingLines(const std::string& text) {
  requireDatabase(Access::kRead);
  OAUTHDBLog log(kLogTable);
  requireReady(log);
  Json::Value rows, lines(Json::arrayValue);
  attempt(log, "read the audit log",
          [&] { return log.Get("", "ORDER BY timestamp, id", &rows) != 0; });
  for (const Json::Value& row : rows) {
    Json::Value line;
    line["id"] = idValue(row);
    line["timestamp"] = static_cast<Json::Int64>(number(row["timestamp"].asString()).value_or(0));
    line["msg"] = asGiven(row["msg"].asString());
    if (contains(line["msg"].asString(), text)) lines.append(line);
  }
  return lines;
}

}  // namespace

void showLog(const Invocation& invocation) {
  wantedLines(invocation, 1);  // a mistake in it comes before all else
  const Json::Value all = matchingLines(invocation.value("--match"));
  Json::Value lines(Json::arrayValue);
  const auto wanted = static_cast<Json::ArrayIndex>(wantedLines(invocation, all.size()));
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
  const int lines = database.rowCount(kLogTable);
  if (lines == 0) {
    say("nothing to delete: the audit log is empty");
    return;
  }
  confirm(invocation, "Delete all " + std::to_string(lines) + " lines of the audit log?");
  OAUTHDBLog log(kLogTable);
  requireReady(log);
  attempt(log, "clear the audit log", [&] { return log.Del() != 0; });
  say("deleted " + std::to_string(lines) + " lines");
}

}  // namespace oauthctl
