#include "checks/file_checks.h"

#include <fcntl.h>
#include <sys/stat.h>
#include <unistd.h>

#include <algorithm>
#include <optional>

#include "checks/settings_report.h"
#include "database/fixed_paths.h"
#include "descriptor.h"
#include "oauth_names.h"

namespace oauthctl {

using ZEVOOAUTHSERVER::Descriptor;

namespace {

std::string octal(mode_t mode) {
  char text[8];
  std::snprintf(text, sizeof text, "%04o", static_cast<unsigned>(mode & 07777U));
  return text;
}

std::optional<struct stat> lstatOf(const std::string& path) {
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

Descriptor openToRead(const std::string& path) {
  return Descriptor(open(path.c_str(), O_RDONLY | O_CLOEXEC | O_NOFOLLOW | O_NONBLOCK));
}

// Looks for the locks of an SQLite writer: a byte for "pending", a byte for "reserved", and the
// range that readers share and that a writer holds alone while it commits.
bool isBeingWritten(const std::string& database) {
  const Descriptor file = openToRead(database);
  if (!file.isOpen()) return false;
  struct flock lock = {};
  lock.l_type = F_RDLCK;
  lock.l_whence = SEEK_SET;
  lock.l_start = 0x40000000;
  lock.l_len = 2 + 510;
  return fcntl(file.value(), F_GETLK, &lock) == 0 && lock.l_type != F_UNLCK;
}

// SQLite ignores a journal that is empty or whose first byte is 0.
bool hasContent(const std::string& journal) {
  const Descriptor file = openToRead(journal);
  if (!file.isOpen()) return true;  // it cannot be read, so suspect it
  char first = 0;
  return read(file.value(), &first, 1) == 1 && first != 0;
}

bool isUnchanged(const std::optional<struct stat>& a, const std::optional<struct stat>& b) {
  return a && b && a->st_ino == b->st_ino && a->st_mtim.tv_sec == b->st_mtim.tv_sec &&
         a->st_mtim.tv_nsec == b->st_mtim.tv_nsec;
}

// Owner and mode of the settings file.
void checkSettingsFile(Findings& findings) {
  const std::string path = fixed_paths::settings();
  const std::optional<struct stat> file = lstatOf(path);
  if (!file || !S_ISREG(file->st_mode)) return;
  if ((file->st_mode & (S_IWGRP | S_IWOTH)) != 0)
    findings.push_back(
        {path + " has mode " + octal(file->st_mode) + ", others may write it", "chmod go-w"});
  // The settings may also belong to root.
  struct stat folder;
  if (file->st_uid != 0 && stat(fixed_paths::folder().c_str(), &folder) == 0)
    checkOwner(path, *file, folder, findings);
}

void checkSettingsContents(const SettingsReport& report, Findings& findings) {
  const std::string path = fixed_paths::settings();
  if (!report.problem.empty())
    findings.push_back(
        {path + " " + report.problem, "correct the file, or check as a user who may read it"});
  for (const SettingInForce& setting : report.settings)
    if (setting.isIgnored)
      findings.push_back({"setting " + setting.name + ": " + setting.origin + " " +
                              std::to_string(setting.value) + " applies",
                          "correct it in " + path});
  for (const std::string& name : report.unknownNames)
    findings.push_back({"setting " + name + " is unknown", "correct its name in " + path});
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
  const std::optional<struct stat> file = lstatOf(path);
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
  // Every change makes a journal and removes it, under a lock. A journal without a lock is left
  // over.
  if (isBeingWritten(path)) return {};
  const std::optional<struct stat> found = lstatOf(journal);
  if (!found || !hasContent(journal) || isBeingWritten(path) ||
      !isUnchanged(found, lstatOf(journal)))
    return {};
  return {
      {journal + " is left over, of user " + std::to_string(found->st_uid) + " and mode " +
           octal(found->st_mode) + ": a program died while it wrote. Contents not checked",
       "never delete it: give it to the folder's owner by chown -h, run 'oauthctl status', which "
       "rolls it back, and check again"}};
}

Findings checkSettings() {
  Findings findings;
  checkSettingsFile(findings);
  const SettingsReport report = readSettings();
  checkSettingsContents(report, findings);
  const bool logs =
      std::any_of(report.settings.begin(), report.settings.end(), [](const auto& setting) {
        return setting.name == ZEVOOAUTHSERVER::names::setting::kLogLevel && setting.value != 0;
      });
  if (logs && lstatOf(fixed_paths::debugMarker()))
    findings.push_back({"diagnostics are on and write secrets to the system log",
                        "set log_level to 0 and delete " + fixed_paths::debugMarker()});
  return findings;
}

}  // namespace oauthctl
