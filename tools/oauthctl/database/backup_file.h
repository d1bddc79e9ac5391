// The backup that the operator names for a restore.

#pragma once

#include <sys/stat.h>

#include <string>

namespace oauthctl {

struct BackupFile {
  std::string bytes;
  struct stat status;
};

// Opens the file once, with the ids that the process has now, and reads it whole. Throws a Failure
// if it is no regular file, larger than any database of ours, or half of a database whose other
// half is a journal beside it.
BackupFile readBackupFile(const std::string& path);

// Throws that the file is refused.
[[noreturn]] void refuseBackup(const std::string& path, const std::string& why);

}  // namespace oauthctl
