// The backup file of a restore.

#pragma once

#include <sys/stat.h>

#include <string>

namespace oauthctl {

struct BackupFile {
  std::string bytes;
  struct stat status;
};

// Opens the file once, with the current ids of the process, and reads all of it. Throws a Failure
// if it is not a regular file, is too large, or has a journal beside it: a database and its journal
// belong together.
BackupFile readBackupFile(const std::string& path);

// Throws the Failure that says why the file is refused.
[[noreturn]] void refuseBackup(const std::string& path, const std::string& why);

}  // namespace oauthctl
