#include "settings_report.h"

#include <json/reader.h>
#include <json/value.h>

#include <algorithm>
#include <cerrno>
#include <cstdio>
#include <cstring>
#include <exception>
#include <memory>

#include "fixed_paths.h"
#include "oauth_utils.h"

namespace oauthctl {
namespace {

constexpr int kLargestCeiling = 10000;

enum class Range { kPositive, kCeiling, kAny };

struct Known {
  const char* name;
  Range range;
  int (*effective)(const std::string& name);
};
constexpr Known kKnown[] = {
    {"client_info_max", Range::kCeiling, getTableRowMax},
    {"grantcode_max", Range::kCeiling, getTableRowMax},
    {"token_max", Range::kCeiling, getTableRowMax},
    {"log_max", Range::kCeiling, getTableRowMax},
    {"grantcode_expired", Range::kPositive, getExpiredPeriod},
    {"token_expired", Range::kPositive, getExpiredPeriod},
    {"log_level", Range::kAny, [](const std::string&) { return getLogLevel(); }},
};

// The file's text; false with errno set if it cannot be read.
bool load(std::string& text) {
  struct Close {
    void operator()(std::FILE* file) const { std::fclose(file); }
  };
  const std::unique_ptr<std::FILE, Close> file(std::fopen(fixed_paths::settings().c_str(), "re"));
  if (!file) return false;
  char block[4096];
  while (const std::size_t count = std::fread(block, 1, sizeof block, file.get()))
    text.append(block, count);
  return std::ferror(file.get()) == 0;
}

// Null, and the problem named, if there is no object to be had.
Json::Value parsed(const std::string& text, std::string& problem) try {
  Json::Value document;
  const std::unique_ptr<Json::CharReader> reader(Json::CharReaderBuilder().newCharReader());
  std::string errors;
  if (!reader->parse(text.data(), text.data() + text.size(), &document, &errors))
    problem = "is not JSON, every default applies";
  else if (!document.isObject())
    problem = "is not a JSON object, every default applies";
  return problem.empty() ? document : Json::Value();
} catch (const std::exception&) {
  problem = "is not JSON, every default applies";
  return {};
}

std::string origin(const Known& known, const Json::Value& file) {
  if (!file.isObject() || !file.isMember(known.name)) return "default";
  const Json::Value& given = file[known.name];
  if (!given.isInt()) return "wrong type in the file, default";
  if (known.range != Range::kAny && given.asInt() < 1) return "below 1 in the file, default";
  if (known.range == Range::kCeiling && given.asInt() > kLargestCeiling)
    return "clamped from " + given.asString();
  return "file";
}

}  // namespace

SettingsReport readSettings() {
  SettingsReport report;
  std::string text;
  Json::Value file;
  if (load(text))
    file = parsed(text, report.problem);
  else if (errno != ENOENT)
    report.problem =
        std::string("cannot be read (") + std::strerror(errno) + "), what follows are defaults";
  for (const Known& known : kKnown) {
    const std::string from = origin(known, file);
    report.settings.push_back(
        {known.name, known.effective(known.name), from, from != "file" && from != "default"});
  }
  if (!file.isObject()) return report;
  for (const std::string& name : file.getMemberNames())
    if (std::none_of(std::begin(kKnown), std::end(kKnown),
                     [&](const Known& known) { return name == known.name; }))
      report.unknownNames.push_back(name);
  return report;
}

}  // namespace oauthctl
