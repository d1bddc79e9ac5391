#include "live_replacement.h"

#include <fcntl.h>
#include <sys/stat.h>
#include <unistd.h>

#include <cerrno>
#include <cstring>
#include <ctime>

#include "database_access.h"
#include "exit_code.h"
#include "fixed_paths.h"
#include "human_time.h"
#include "new_file.h"

namespace oauthctl {
namespace {

class Descriptor {
 public:
  explicit Descriptor(int value) : value_(value) {}
  ~Descriptor() {
    if (value_ >= 0) close(value_);
  }
  Descriptor(const Descriptor&) = delete;
  Descriptor& operator=(const Descriptor&) = delete;
  int value() const { return value_; }

 private:
  const int value_;
};

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
    if (access(candidate.c_str(), F_OK) != 0) return candidate;
  }
}

void copyBytes(int from, const std::string& path) {
  const Descriptor to(open(path.c_str(), O_WRONLY | O_TRUNC | O_CLOEXEC));
  if (to.value() < 0) cannotKeep(path);
  char block[65536];
  off_t offset = 0;
  for (ssize_t count = 0; (count = pread(from, block, sizeof block, offset)) != 0;) {
    if (count < 0 || write(to.value(), block, static_cast<std::size_t>(count)) != count)
      cannotKeep(path);
    offset += count;
  }
}

// A file that no SQLite can open any more, and its journal, which must not reach the new one.
std::string moveAside() {
  const std::string path = fixed_paths::database();
  std::string kept = freeName();
  if (rename(path.c_str(), kept.c_str()) != 0) cannotKeep(kept);
  chmod(kept.c_str(), S_IRUSR | S_IWUSR);
  rename((path + "-journal").c_str(), (kept + "-journal").c_str());
  return kept;
}

void makeNew(DatabaseImage& image) {
  NewFile file(fixed_paths::database());
  image.writeTo(file.path());
  giveToFolderOwner(file.path());
  file.publish();
}

// Under the exclusive lock that the copy holds, the bytes of the file are one moment of it. The
// descriptor was opened before the connection and is closed after it: closing any descriptor of a
// file gives up all locks that the process has on it.
std::string replaceContents(DatabaseImage& image) {
  const std::string path = fixed_paths::database();
  const Descriptor bytes(open(path.c_str(), O_RDONLY | O_CLOEXEC));
  SqliteConnection live(path, SQLITE_OPEN_READWRITE);
  DatabaseCopy copy(image.connection(), live);
  copy.lockTarget();
  struct stat status;
  std::string kept;
  if (bytes.value() < 0 || fstat(bytes.value(), &status) != 0) cannotKeep(path);
  if (status.st_size == 0) {
    copy.finish();
    return kept;
  }
  kept = freeName();
  NewFile file(kept);
  copyBytes(bytes.value(), file.path());
  giveToFolderOwner(file.path());
  file.publish();
  try {
    copy.finish();
  } catch (const SqliteError&) {
    unlink(kept.c_str());
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
