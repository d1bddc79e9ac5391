#include "live_replacement.h"

#include <fcntl.h>
#include <sys/stat.h>
#include <unistd.h>

#include <cerrno>
#include <cstdio>
#include <cstring>
#include <ctime>

#include "database_access.h"
#include "database_folder.h"
#include "descriptor.h"
#include "exit_code.h"
#include "fixed_paths.h"
#include "human_time.h"
#include "new_file.h"

namespace oauthctl {
namespace {

// Everything below happens in the folder of the database, with its owner's ids.
int folder() { return DatabaseFolder::enter().descriptor(); }
std::string liveName() { return nameOf(fixed_paths::database()); }

Descriptor openLive() {
  return Descriptor(
      openat(folder(), liveName().c_str(), O_RDONLY | O_CLOEXEC | O_NOFOLLOW | O_NONBLOCK));
}

[[noreturn]] void cannotKeep(const std::string& path) {
  throw Failure(ExitCode::kAttention, "nothing changed, cannot keep what was there in " + path +
                                          ": " + std::strerror(errno));
}

// ".../oauth.db.before-restore-20261121-093000", with a number behind if that is taken.
std::string freeName() {
  const auto now = static_cast<std::time_t>(unixNow());
  std::tm parts = {};
  char stamp[32] = "";
  if (localtime_r(&now, &parts) != nullptr)
    std::strftime(stamp, sizeof stamp, "%Y%m%d-%H%M%S", &parts);
  const std::string name = fixed_paths::database() + ".before-restore-" + stamp;
  for (int n = 1;; ++n) {
    std::string candidate = n == 1 ? name : name + "-" + std::to_string(n);
    if (!DatabaseFolder::enter().look(nameOf(candidate))) return candidate;
  }
}

void copyBytes(const Descriptor& from, NewFile& to, const std::string& path) {
  char block[65536];
  off_t offset = 0;
  for (ssize_t count = 0; (count = pread(from.value(), block, sizeof block, offset)) != 0;) {
    if (count < 0) cannotKeep(path);
    to.append(block, static_cast<std::size_t>(count));
    offset += count;
  }
}

// Never in another file's place.
bool moveTo(const std::string& kept, const std::string& suffix) {
  const std::string from = liveName() + suffix, to = nameOf(kept) + suffix;
  if (renameat2(folder(), from.c_str(), folder(), to.c_str(), RENAME_NOREPLACE) == 0) return true;
  // An older kernel or file system: a second name does the same.
  return (errno == EINVAL || errno == ENOSYS) &&
         linkat(folder(), from.c_str(), folder(), to.c_str(), 0) == 0 &&
         unlinkat(folder(), from.c_str(), 0) == 0;
}

// A file that no SQLite can open any more, and its journal, which must not reach the new one.
std::string moveAside() {
  const Descriptor ruined = openLive();
  std::string kept = freeName();
  if (!ruined.isOpen()) cannotKeep(kept);
  fchmod(ruined.value(), S_IRUSR | S_IWUSR);
  if (!moveTo(kept, "")) cannotKeep(kept);
  moveTo(kept, "-journal");
  return kept;
}

void makeNew(const DatabaseImage& image) {
  NewFile file(folder(), fixed_paths::database());
  file.append(image.bytes());
  file.publish();
}

// A copy of the bytes under a name of its own.
std::string keep(const Descriptor& bytes) {
  std::string kept = freeName();
  NewFile file(folder(), kept);
  copyBytes(bytes, file, kept);
  file.publish();
  return kept;
}

// Under the exclusive lock that the copy holds, the bytes of the file are one moment of it. The
// descriptor was opened before the connection and is closed after it: closing any descriptor of a
// file gives up all locks that the process has on it.
std::string replaceContents(DatabaseImage& image) {
  const Descriptor bytes = openLive();
  SqliteConnection live(fixed_paths::database(), SQLITE_OPEN_READWRITE);
  DatabaseCopy copy(image.connection(), live);
  copy.lockTarget();
  struct stat status;
  if (!bytes.isOpen() || fstat(bytes.value(), &status) != 0) cannotKeep(fixed_paths::database());
  std::string kept = status.st_size == 0 ? "" : keep(bytes);
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
    if (error.isBusy())
      throw Failure(ExitCode::kUnavailable, "the database is busy, nothing changed: try again");
    if (!error.isDamage())
      throw Failure(ExitCode::kAttention,
                    std::string("cannot restore, nothing changed: ") + error.what());
  }
  // Too damaged to be written into, hence of no use to any program either.
  std::string kept = moveAside();
  makeNew(image);
  return kept;
}

}  // namespace oauthctl
