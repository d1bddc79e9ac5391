#include "oauth_utils.h"

#include <json/value.h>
#include <unistd.h>

#include <cstring>
#include <exception>
#include <utility>

#include "host_libraries.h"
#include "oauth_names.h"
#include "oauth_settings.h"
#include "oauth_syslog.h"
#include "random_bytes.h"
#include "settings_file.h"
#include "sqlite_text.h"

namespace ZEVOOAUTHSERVER {
namespace {

constexpr int kUndecided = -1;
thread_local int debugSwitch = kUndecided;  // then 0 or 1
thread_local int levelMask = kUndecided;

// The value in force for the key. Where the file has no such integer, where anything is wrong with
// the file, and where memory runs out, that is the fallback.
int readSetting(const std::string& key, const SettingRange& range) try {
  Json::Value settings;
  if (readSettingsFile(names::path::kSettings, settings) != SettingsState::kRead)
    return range.fallback;
  const Json::Value& value = std::as_const(settings)[key];
  return value.isInt() ? range.inForce(value.asInt()) : range.fallback;
} catch (const std::exception&) {
  return range.fallback;
}

// The text that SQLite's formatter returned, or the empty string if memory ran out.
std::string toString(const SqliteText& formatted) {
  if (formatted) return formatted.get();
  OAUTH_FAIL("Can't transfer to SQL format");
  return {};
}

}  // namespace

bool isDebugEnabled() {
  if (debugSwitch == kUndecided) debugSwitch = access(names::path::kDebugMarker, R_OK) == 0 ? 1 : 0;
  return debugSwitch == 1;
}

int getLogLevel() {
  if (levelMask == kUndecided) levelMask = readSetting(names::setting::kLogLevel, kLevelMask);
  return levelMask;
}

int getExpiredPeriod(const std::string& key) { return readSetting(key, kLifetime); }

int getTableRowMax(const std::string& key) { return readSetting(key, kRowCeiling); }

bool checkStrLen(const std::string& str, int minLen, int maxLen, bool allowEmpty) {
  OAUTH_DIAG(kArgument, "%s[%s]", __func__, str.c_str());
  const auto length = static_cast<long long>(str.size());
  if (allowEmpty && length == 0) return true;
  if (length < minLen) return false;
  return length <= maxLen;
}

std::string getRemoteIP() {
  char address[1024] = {};
  if (ZevoCgiGetRemoteIP(address, sizeof address) != 0) return {};
  return {address, strnlen(address, sizeof address)};
}

std::string getSQLFormatStr(const std::string& value) {
  return toString(SqliteText(sqlite3_mprintf("%q", value.c_str())));
}

std::string getSQLFormatLikeStr(const std::string& column, const std::string& value) {
  return toString(SqliteText(sqlite3_mprintf("%s like '%%%q%%'", column.c_str(), value.c_str())));
}

std::string getRandomStr(unsigned int length) {
  constexpr char kHexDigits[] = "0123456789abcdef";
  std::string result;
  while (result.size() < length) {
    // A version-4 UUID. No generator is kept between calls: each asks the operating system.
    unsigned char bytes[16];
    if (!fillWithRandomBytes(bytes, sizeof bytes)) return {};
    bytes[6] = static_cast<unsigned char>((bytes[6] & 0x0F) | 0x40);  // version 4
    bytes[8] = static_cast<unsigned char>((bytes[8] & 0x3F) | 0x80);  // variant of RFC 4122
    char digits[32];
    char* digit = digits;
    for (const unsigned byte : bytes) {
      *digit++ = kHexDigits[byte >> 4];
      *digit++ = kHexDigits[byte & 15];
    }
    result.append(digits, sizeof digits);
  }
  return result;
}

}  // namespace ZEVOOAUTHSERVER
