#include "file_checks.h"

#include <fcntl.h>
#include <sys/stat.h>
#include <unistd.h>

#include <optional>

#include "fixed_paths.h"
#include "settings_report.h"

namespace oauthctl {
namespace {

std::string octal(mode_t mode) {
  char text[8];
  std::snprintf(text, sizeof text, "%04o", static_cast<unsigned>(mode & 07777U));
  return text;
}

std::optional<struct stat> look(const std::string& path) {
  struct stat status;
  if (lstat(path.c_str(), &status) != 0) return std::nullopt;
  return status;
}

void checkOwner(const std::string& path, const struct stat& status, const struct stat& folder,
                Findings& findings) {
  if (status.st_uid == folder.st_uid) return;
  findings.push_back({path + " belongs to user " + std::to_string(status.st_uid) +
                          " and its folder to user " + std::to_string(folder.st_uid),
                      "give both to the server's user by chown -h"});
}

// SQLite's locks for writing: one byte that says "pending", one that says "reserved", and the range
// that readers share and a committing writer has alone.
bool somebodyWrites(const std::string& database) {
  const int descriptor = open(database.c_str(), O_RDONLY | O_CLOEXEC | O_NOFOLLOW | O_NONBLOCK);
  if (descriptor < 0) return false;
  struct flock lock = {};
  lock.l_type = F_RDLCK;
  lock.l_whence = SEEK_SET;
  lock.l_start = 0x40000000;
  lock.l_len = 2 + 510;
  const bool locked = fcntl(descriptor, F_GETLK, &lock) == 0 && lock.l_type != F_UNLCK;
  close(descriptor);
  return locked;
}

// SQLite takes an empty journal, or one whose first byte is 0, for no journal.
bool holdsSomething(const std::string& journal) {
  const int descriptor = open(journal.c_str(), O_RDONLY | O_CLOEXEC | O_NOFOLLOW | O_NONBLOCK);
  if (descriptor < 0) return true;  // not for us to read: suspect it
  char first = 0;
  const bool read = ::read(descriptor, &first, 1) == 1;
  close(descriptor);
  return read && first != 0;
}

bool sameFile(const std::optional<struct stat>& a, const std::optional<struct stat>& b) {
  return a && b && a->st_ino == b->st_ino && a->st_mtim.tv_sec == b->st_mtim.tv_sec &&
         a->st_mtim.tv_nsec == b->st_mtim.tv_nsec;
}

}  // namespace

Findings checkFolder(const std::string& path) {
  struct stat folder;
  if (stat(path.c_str(), &folder) != 0 || (folder.st_mode & (S_IWGRP | S_IWOTH)) == 0) return {};
  return {{path + " has mode " + octal(folder.st_mode) + ": others can replace the database",
           "chmod go-w"}};
}

Findings checkFiles() {
  Findings findings;
  const std::string path = fixed_paths::database(), directory = fixed_paths::folder();
  const std::optional<struct stat> file = look(path);
  struct stat folder;
  if (!file || stat(directory.c_str(), &folder) != 0) return findings;
  if (file->st_nlink > 1)
    findings.push_back({path + " has other names too (" + std::to_string(file->st_nlink - 1) + ")",
                        "remove the other links, copies are made by 'oauthctl backup'"});
  if ((file->st_mode & (S_IRWXO | S_IWGRP | S_IXGRP)) != 0)
    findings.push_back(
        {path + " has mode " + octal(file->st_mode) + ", open to other users", "chmod 600"});
  for (const Finding& finding : checkFolder(directory)) findings.push_back(finding);
  checkOwner(path, *file, folder, findings);
  return findings;
}

Findings checkJournal() {
  const std::string path = fixed_paths::database(), journal = path + "-journal";
  // A journal comes and goes with every change, under a lock: only one without a lock is left over.
  if (somebodyWrites(path)) return {};
  const std::optional<struct stat> found = look(journal);
  if (!found || !holdsSomething(journal) || somebodyWrites(path) || !sameFile(found, look(journal)))
    return {};
  return {
      {journal + " is left over, of user " + std::to_string(found->st_uid) + " and mode " +
           octal(found->st_mode) + ": a program died while it wrote. Contents not checked",
       "never delete it: give it to the folder's owner by chown -h, run 'oauthctl status', which "
       "rolls it back, and check again"}};
}

Findings checkSettings() {
  Findings findings;
  const std::string path = fixed_paths::settings();
  const std::optional<struct stat> file = look(path);
  struct stat folder;
  if (file && S_ISREG(file->st_mode) && (file->st_mode & (S_IWGRP | S_IWOTH)) != 0)
    findings.push_back(
        {path + " has mode " + octal(file->st_mode) + ", others may write it", "chmod go-w"});
  // Root may keep the settings to himself.
  if (file && S_ISREG(file->st_mode) && file->st_uid != 0 &&
      stat(fixed_paths::folder().c_str(), &folder) == 0)
    checkOwner(path, *file, folder, findings);
  const SettingsReport report = readSettings();
  if (!report.problem.empty())
    findings.push_back(
        {path + " " + report.problem, "correct the file, or check as a user who may read it"});
  for (const Setting& setting : report.settings)
    if (setting.isIgnored)
      findings.push_back({"setting " + setting.name + ": " + setting.origin + " " +
                              std::to_string(setting.value) + " applies",
                          "correct it in " + path});
  for (const std::string& name : report.unknownNames)
    findings.push_back({"setting " + name + " is unknown", "correct its name in " + path});
  const Setting& logLevel = report.settings.back();
  if (logLevel.value != 0 && look(fixed_paths::debugMarker()))
    findings.push_back({"diagnostics are on and write secrets to the system log",
                        "set log_level to 0 and delete " + fixed_paths::debugMarker()});
  return findings;
}

}  // namespace oauthctl
