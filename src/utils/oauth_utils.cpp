#include "oauth_utils.h"

#include <json/reader.h>
#include <json/value.h>
#include <unistd.h>

// The device and not the system call, which older kernels of the appliance lack.
#define BOOST_UUID_RANDOM_PROVIDER_FORCE_POSIX
#include <boost/uuid/random_generator.hpp>
#include <cstdio>
#include <cstring>
#include <exception>
#include <memory>
#include <utility>

#include "host_libraries.h"
#include "oauth_names.h"
#include "oauth_syslog.h"
#include "sqlite_text.h"

namespace ZEVOOAUTHSERVER {
namespace {

constexpr int kUndecided = -1;
thread_local int debugSwitch = kUndecided;  // then 0 or 1
thread_local int levelMask = kUndecided;

constexpr int kDefaultPeriod = 600;  // seconds
constexpr int kDefaultRowMax = 1000, kLargestRowMax = 10000;

struct CloseFile {
  void operator()(std::FILE* file) const { std::fclose(file); }
};

// Reads the whole settings file; false where that fails, for example on a directory.
bool loadSettings(std::string& text) {
  const std::unique_ptr<std::FILE, CloseFile> file(std::fopen(names::path::kSettings, "re"));
  if (!file) return false;
  char block[4096];
  while (const std::size_t count = std::fread(block, 1, sizeof block, file.get()))
    text.append(block, count);
  return std::ferror(file.get()) == 0;
}

// Parses a JSON document, comments allowed, a byte order mark passed over. By the older of the JSON
// library's readers: the newer one is made from a document of options, which takes longer than
// reading the settings does.
bool parseDocument(const std::string& text, Json::Value& document) {
  constexpr char kByteOrderMark[] = "\xEF\xBB\xBF";
  const std::size_t start = text.rfind(kByteOrderMark, 0) == 0 ? std::strlen(kByteOrderMark) : 0;
#pragma GCC diagnostic push
#pragma GCC diagnostic ignored "-Wdeprecated-declarations"
  return Json::Reader().parse(text.data() + start, text.data() + text.size(), document, false);
#pragma GCC diagnostic pop
}

// The integer stored under the key in the settings file, or 0. Whatever is wrong with the file
// reads as 0, including what makes the parser throw, such as very deep nesting.
int readSettingInt(const std::string& key) try {
  std::string text;
  Json::Value settings;
  if (!loadSettings(text) || !parseDocument(text, settings) || !settings.isObject()) return 0;
  const Json::Value& value = std::as_const(settings)[key];
  return value.isInt() ? value.asInt() : 0;
} catch (const std::exception&) {
  return 0;
}

// What SQLite's formatter made, or the empty string if memory ran out.
std::string taken(const SqliteText& formatted) {
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
  if (levelMask == kUndecided) levelMask = readSettingInt(names::setting::kLogLevel);
  return levelMask;
}

int getExpiredPeriod(const std::string& key) {
  const int period = readSettingInt(key);
  return period > 0 ? period : kDefaultPeriod;
}

int getTableRowMax(const std::string& key) {
  const int max = readSettingInt(key);
  if (max < 1) return kDefaultRowMax;
  return max > kLargestRowMax ? kLargestRowMax : max;
}

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
  return taken(SqliteText(sqlite3_mprintf("%q", value.c_str())));
}

std::string getSQLFormatLikeStr(const std::string& column, const std::string& value) {
  return taken(SqliteText(sqlite3_mprintf("%s like '%%%q%%'", column.c_str(), value.c_str())));
}

std::string getRandomStr(unsigned int length) try {
  constexpr char kHexDigits[] = "0123456789abcdef";
  std::string result;
  while (result.size() < length) {
    // Reads the operating system's entropy for every UUID; no generator is kept between calls.
    char digits[32];
    char* digit = digits;
    for (const unsigned byte : boost::uuids::random_generator()()) {
      *digit++ = kHexDigits[byte >> 4];
      *digit++ = kHexDigits[byte & 15];
    }
    result.append(digits, sizeof digits);
  }
  return result;
} catch (const boost::uuids::entropy_error&) {
  return {};
}

}  // namespace ZEVOOAUTHSERVER
