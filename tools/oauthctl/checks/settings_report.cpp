#include "checks/settings_report.h"

#include <json/value.h>

#include <algorithm>
#include <cerrno>
#include <cstring>

#include "database/fixed_paths.h"
#include "oauth_settings.h"
#include "settings_file.h"

namespace oauthctl {
namespace {

using ZEVOOAUTHSERVER::kSettings;
using ZEVOOAUTHSERVER::Setting;
using ZEVOOAUTHSERVER::SettingsState;

// What is wrong with the whole file, "" if nothing is.
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

// The value in the file, null if there is none.
const Json::Value& valueInFile(const Setting& setting, const Json::Value& file) {
  return file.isObject() ? file[setting.name] : Json::Value::nullSingleton();
}

std::string originOf(const Setting& setting, const Json::Value& file) {
  if (!file.isObject() || !file.isMember(setting.name)) return "default";
  const Json::Value& value = valueInFile(setting, file);
  if (!value.isInt()) return "wrong type in the file, default";
  if (value.asInt() < setting.range.smallest)
    return "below " + std::to_string(setting.range.smallest) + " in the file, default";
  if (value.asInt() > setting.range.largest) return "clamped from " + value.asString();
  return "file";
}

int valueOf(const Setting& setting, const Json::Value& file) {
  const Json::Value& value = valueInFile(setting, file);
  return value.isInt() ? setting.range.inForce(value.asInt()) : setting.range.fallback;
}

bool isSetting(const std::string& name) {
  return std::any_of(std::begin(kSettings), std::end(kSettings),
                     [&](const Setting& setting) { return name == setting.name; });
}

}  // namespace

SettingsReport readSettings() {
  SettingsReport report;
  Json::Value file;
  const SettingsState state = ZEVOOAUTHSERVER::readSettingsFile(fixed_paths::settings(), file);
  report.problem = problemOf(state);
  if (state != SettingsState::kRead) file = Json::Value();
  for (const Setting& setting : kSettings) {
    const std::string origin = originOf(setting, file);
    report.settings.push_back(
        {setting.name, valueOf(setting, file), origin, origin != "file" && origin != "default"});
  }
  if (!file.isObject()) return report;
  for (const std::string& name : file.getMemberNames())
    if (!isSetting(name)) report.unknownNames.push_back(name);
  return report;
}

}  // namespace oauthctl
