#include "settings_report.h"

#include <json/value.h>

#include <algorithm>
#include <cerrno>
#include <cstring>

#include "fixed_paths.h"
#include "oauth_utils.h"
#include "settings_file.h"

namespace oauthctl {
namespace {

using ZEVOOAUTHSERVER::SettingsState;

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

// What is wrong with the file as a whole, "" if nothing is.
std::string problemOf(SettingsState state) {
  switch (state) {
    case SettingsState::kRead:
    case SettingsState::kAbsent:
      return {};
    case SettingsState::kUnreadable:
      return std::string("cannot be read (") + std::strerror(errno) +
             "), what follows are defaults";
    case SettingsState::kNotAFile:
      return "is not a regular file, every default applies";
    case SettingsState::kTooLarge:
      return "is larger than " + std::to_string(ZEVOOAUTHSERVER::kLargestSettings) +
             " bytes, every default applies";
    case SettingsState::kNotJson:
      return "is not JSON, every default applies";
    case SettingsState::kNotAnObject:
      return "is not a JSON object, every default applies";
  }
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
  Json::Value file;
  const SettingsState state = ZEVOOAUTHSERVER::readSettingsFile(fixed_paths::settings(), file);
  report.problem = problemOf(state);
  if (state != SettingsState::kRead) file = Json::Value();
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
