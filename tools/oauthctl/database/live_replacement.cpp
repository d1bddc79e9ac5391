#include "database/live_replacement.h"

#include <fcntl.h>
#include <sys/stat.h>
#include <unistd.h>

#include <cerrno>
#include <cstdio>
#include <cstring>
#include <ctime>

#include "database/access.h"
#include "database/fixed_paths.h"
#include "database/folder.h"
#include "database/new_file.h"
#include "descriptor.h"
#include "terminal/exit_code.h"
#include "unix_time.h"

namespace oauthctl {

using ZEVOOAUTHSERVER::Descriptor;

namespace {

// Every function below works in the folder of the database, with the ids of its owner.
int folder() { return DatabaseFolder::enter().descriptor(); }
std::string liveName() { return nameOf(fixed_paths::database()); }

Descriptor openLive() {
  return Descriptor(
      openat(folder(), liveName().c_str(), O_RDONLY | O_CLOEXEC | O_NOFOLLOW | O_NONBLOCK));
}

[[noreturn]] void throwCannotKeep(const std::string& path) {
  throw Failure(ExitCode::kAttention, "nothing changed, cannot keep what was there in " + path +
                                          ": " + std::strerror(errno));
}

// ".../oauth.db.before-restore-20261121-093000", with "-2" and so on added if that name is taken.
std::string freePath() {
  const auto now = static_cast<std::time_t>(ZEVOOAUTHSERVER::unixNow());
  std::tm parts = {};
  char stamp[32] = "";
  if (localtime_r(&now, &parts) != nullptr)
    std::strftime(stamp, sizeof stamp, "%Y%m%d-%H%M%S", &parts);
  const std::string name = fixed_paths::database() + ".before-restore-" + stamp;
  for (int n = 1;; ++n) {
    std::string candidate = n == 1 ? name : name + "-" + std::to_string(n);
    if (!DatabaseFolder::enter().lstatOf(nameOf(candidate))) return candidate;
  }
}

void copyBytes(const Descriptor& from, NewFile& to, const std::string& path) {
  char block[65536];
  off_t offset = 0;
  for (ssize_t count = 0; (count = pread(from.value(), block, sizeof block, offset)) != 0;) {
    if (count < 0) throwCannotKeep(path);
    to.append(block, static_cast<std::size_t>(count));
    offset += count;
  }
}

// Renames the database, or its file with this suffix. Never replaces a file.
bool moveTo(const std::string& kept, const std::string& suffix) {
  const std::string from = liveName() + suffix, to = nameOf(kept) + suffix;
  if (renameat2(folder(), from.c_str(), folder(), to.c_str(), RENAME_NOREPLACE) == 0) return true;
  // An older kernel or file system does not know the flag: give a second name, then remove the
  // first.
  return (errno == EINVAL || errno == ENOSYS) &&
         linkat(folder(), from.c_str(), folder(), to.c_str(), 0) == 0 &&
         unlinkat(folder(), from.c_str(), 0) == 0;
}

// Moves away a file that SQLite can no longer open, and its journal, which must not be applied to
// the new file. Returns the new path.
std::string moveAside() {
  const Descriptor damaged = openLive();
  std::string kept = freePath();
  if (!damaged.isOpen()) throwCannotKeep(kept);
  fchmod(damaged.value(), S_IRUSR | S_IWUSR);
  if (!moveTo(kept, "")) throwCannotKeep(kept);
  moveTo(kept, "-journal");
  return kept;
}

void makeNew(const DatabaseImage& image) {
  NewFile file(folder(), fixed_paths::database());
  file.append(image.bytes());
  file.publish();
}

// Copies the bytes to a new file, and returns its path.
std::string keepCopy(const Descriptor& bytes) {
  std::string kept = freePath();
  NewFile file(folder(), kept);
  copyBytes(bytes, file, kept);
  file.publish();
  return kept;
}

// The copy holds the exclusive lock, so the bytes of the file do not change meanwhile. The
// descriptor is opened before the connection and closed after it: closing any descriptor of a file
// releases all locks that the process has on it.
std::string replaceContents(DatabaseImage& image) {
  const Descriptor bytes = openLive();
  SqliteConnection live(fixed_paths::database(), SQLITE_OPEN_READWRITE);
  DatabaseCopy copy(image.connection(), live);
  copy.lockTarget();
  struct stat status;
  if (!bytes.isOpen() || fstat(bytes.value(), &status) != 0)
    throwCannotKeep(fixed_paths::database());
  std::string kept = status.st_size == 0 ? "" : keepCopy(bytes);
  try {
    copy.finish();
  } catch (const SqliteError&) {
    if (!kept.empty()) unlinkat(folder(), nameOf(kept).c_str(), 0);
    throw;
  }
  return kept;
}

}  // namespace

std::string replaceLiveDatabase(DatabaseImage& image) {
  try {
    if (databaseExists()) return replaceContents(image);
    makeNew(image);
    return {};
  } catch (const SqliteError& error) {
    if (error.isBusy()) throwUnavailable("the database is busy, nothing changed: try again");
    if (!error.isDamage())
      throw Failure(ExitCode::kAttention,
                    std::string("cannot restore, nothing changed: ") + error.what());
  }
  // The file is too damaged to be written, so no program can use it either.
  std::string kept = moveAside();
  makeNew(image);
  return kept;
}

}  // namespace oauthctl
