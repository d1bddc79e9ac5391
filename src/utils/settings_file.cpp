#include "settings_file.h"

#include <fcntl.h>
#include <json/reader.h>
#include <sys/stat.h>
#include <unistd.h>

#include <cerrno>
#include <cstring>
#include <exception>

#include "descriptor.h"

namespace ZEVOOAUTHSERVER {
namespace {

// Reads to the end, or to the first byte beyond the largest size. False if a read fails.
bool readUpToLimit(int file, std::string& text) {
  char block[4096];
  while (text.size() <= kLargestSettings) {
    const ssize_t count = read(file, block, sizeof block);
    if (count == 0) return true;
    if (count > 0)
      text.append(block, static_cast<std::size_t>(count));
    else if (errno != EINTR)
      return false;
  }
  return true;
}

// kRead if the text could be read; it need not be JSON. O_NONBLOCK: without it, opening a pipe
// would wait for a writer.
SettingsState load(const std::string& path, std::string& text) {
  const Descriptor file(open(path.c_str(), O_RDONLY | O_NONBLOCK | O_NOCTTY | O_CLOEXEC));
  if (!file.isOpen()) return errno == ENOENT ? SettingsState::kAbsent : SettingsState::kUnreadable;
  struct stat status;
  if (fstat(file.value(), &status) != 0) return SettingsState::kUnreadable;
  if (!S_ISREG(status.st_mode)) return SettingsState::kNotAFile;
  if (!readUpToLimit(file.value(), text)) return SettingsState::kUnreadable;
  return text.size() > kLargestSettings ? SettingsState::kTooLarge : SettingsState::kRead;
}

// Comments are allowed, and a byte order mark is skipped. This is the older of the JSON library's
// readers: the newer one is made from a document of options, which takes longer than reading the
// settings does.
bool parse(const std::string& text, Json::Value& document) try {
  constexpr char kByteOrderMark[] = "\xEF\xBB\xBF";
  const std::size_t start = text.rfind(kByteOrderMark, 0) == 0 ? std::strlen(kByteOrderMark) : 0;
#pragma GCC diagnostic push
#pragma GCC diagnostic ignored "-Wdeprecated-declarations"
  return Json::Reader().parse(text.data() + start, text.data() + text.size(), document, false);
#pragma GCC diagnostic pop
} catch (const std::exception&) {  // The parser throws on very deep nesting, for example.
  return false;
}

}  // namespace

SettingsState readSettingsFile(const std::string& path, Json::Value& document) {
  std::string text;
  const SettingsState state = load(path, text);
  if (state != SettingsState::kRead) return state;
  if (!parse(text, document)) return SettingsState::kNotJson;
  return document.isObject() ? SettingsState::kRead : SettingsState::kNotAnObject;
}

}  // namespace ZEVOOAUTHSERVER
