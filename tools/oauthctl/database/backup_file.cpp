#include "database/backup_file.h"

#include <fcntl.h>

#include <cerrno>
#include <cstring>

#include "database/image.h"
#include "descriptor.h"
#include "terminal/exit_code.h"

namespace oauthctl {

using ZEVOOAUTHSERVER::Descriptor;

namespace {

[[noreturn]] void throwUnreadable(const std::string& path) {
  throw Failure(ExitCode::kAttention, "cannot read " + path + ": " + std::strerror(errno));
}

// SQLite ignores a journal that is empty or whose first byte is 0.
void requireNoJournal(const std::string& path) {
  for (const char* const suffix : {"-journal", "-wal"}) {
    const Descriptor journal(
        open((path + suffix).c_str(), O_RDONLY | O_CLOEXEC | O_NOFOLLOW | O_NONBLOCK));
    char first = 0;
    if (!journal.isOpen() ? errno != ENOENT
                          : pread(journal.value(), &first, 1, 0) != 0 && first != 0)
      refuseBackup(path, "it is half of a database, the other half is " + path + suffix);
  }
}

std::string readWhole(const Descriptor& file, std::size_t size, const std::string& path) {
  std::string bytes(size, '\0');
  std::size_t done = 0;
  while (done < size) {
    const ssize_t count = read(file.value(), bytes.data() + done, size - done);
    if (count < 0 && errno == EINTR) continue;
    if (count < 0) throwUnreadable(path);
    if (count == 0) break;
    done += static_cast<std::size_t>(count);
  }
  bytes.resize(done);
  return bytes;
}

}  // namespace

void refuseBackup(const std::string& path, const std::string& why) {
  throw Failure(ExitCode::kAttention, path + " is refused, nothing changed: " + why);
}

BackupFile readBackupFile(const std::string& path) {
  // Follow no link. If it is a pipe, do not wait for a writer.
  const Descriptor file(open(path.c_str(), O_RDONLY | O_CLOEXEC | O_NOFOLLOW | O_NONBLOCK));
  if (!file.isOpen() && errno == ELOOP) refuseBackup(path, "it is a link, name the file itself");
  BackupFile backup;
  if (!file.isOpen() || fstat(file.value(), &backup.status) != 0) throwUnreadable(path);
  if (!S_ISREG(backup.status.st_mode)) refuseBackup(path, "it is not a file");
  if (backup.status.st_size > kLargestDatabase) refuseBackup(path, "it is too large for a backup");
  requireNoJournal(path);
  backup.bytes = readWhole(file, static_cast<std::size_t>(backup.status.st_size), path);
  return backup;
}

}  // namespace oauthctl
