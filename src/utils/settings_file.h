// The settings file, as the library and the operator's program read it.

#pragma once

#include <json/value.h>

#include <cstddef>
#include <string>

namespace ZEVOOAUTHSERVER {

enum class SettingsState {
  kRead,        // a JSON object
  kAbsent,      // no such file
  kUnreadable,  // errno tells why
  kNotAFile,    // a folder, pipe or device, which is never read from
  kTooLarge,    // more than kLargestSettings bytes
  kNotJson,
  kNotAnObject,
};

inline constexpr std::size_t kLargestSettings = 1'048'576;

// Reads the settings file at the path. The document is an object after kRead, and null or of no use
// after anything else. Never waits, whatever lies at the path.
SettingsState readSettingsFile(const std::string& path, Json::Value& document);

}  // namespace ZEVOOAUTHSERVER
