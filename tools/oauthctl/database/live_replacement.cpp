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

// Renames a file of the folder. Never replaces another one.
bool renameToFree(const std::string& from, const std::string& to) {
  return renameat2(folder(), from.c_str(), folder(), to.c_str(), RENAME_NOREPLACE) == 0 ||
         // An older kernel or file system does not know the flag: give a second name, then remove
         // the first.
         ((errno == EINVAL || errno == ENOSYS) &&
          linkat(folder(), from.c_str(), folder(), to.c_str(), 0) == 0 &&
          unlinkat(folder(), from.c_str(), 0) == 0);
}

// Names the file that SQLite can no longer open "kept". If the file system has second names, the
// file keeps its first one too. Moves the journal, which must not be applied to another file.
void keepAside(const std::string& kept) {
  const Descriptor damaged = openLive();
  if (!damaged.isOpen()) throwCannotKeep(kept);
  if (linkat(folder(), liveName().c_str(), folder(), nameOf(kept).c_str(), 0) != 0 &&
      !renameToFree(liveName(), nameOf(kept)))
    throwCannotKeep(kept);
  fchmod(damaged.value(), S_IRUSR | S_IWUSR);
  renameToFree(liveName() + "-journal", nameOf(kept) + "-journal");
}

// Undoes keepAside(), unless another file has the name by now. Returns whether it was undone.
bool putBack(const std::string& kept) {
  const auto live = DatabaseFolder::enter().lstatOf(liveName());
  const auto old = DatabaseFolder::enter().lstatOf(nameOf(kept));
  if (!old || (live && (live->st_dev != old->st_dev || live->st_ino != old->st_ino))) return false;
  const bool done = live ? unlinkat(folder(), nameOf(kept).c_str(), 0) == 0
                         : renameToFree(nameOf(kept), liveName());
  if (done) renameToFree(nameOf(kept) + "-journal", liveName() + "-journal");
  return done;
}

// Replaces a file that SQLite can no longer open. Returns the path of what was there. The new file
// is on the disk, all but its name, before the old one is touched.
std::string replaceFile(const DatabaseImage& image) {
  NewFile file(folder(), fixed_paths::database(), NewFile::Existing::kReplace);
  file.append(image.bytes());
  file.bringToDisk();
  std::string kept = freePath();
  keepAside(kept);
  try {
    file.publish();
  } catch (const Failure& failure) {
    throw Failure(ExitCode::kAttention,
                  failure.what() + (putBack(kept) ? std::string(", nothing changed")
                                                  : ", what was there is kept in " + kept));
  }
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
  return replaceFile(image);
}

}  // namespace oauthctl
