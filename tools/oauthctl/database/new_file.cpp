#include "database/new_file.h"

#include <fcntl.h>
#include <sys/stat.h>

#include <cerrno>
#include <cstring>
#include <utility>

#include "database/folder.h"
#include "oauth_utils.h"
#include "terminal/exit_code.h"

namespace oauthctl {

using ZEVOOAUTHSERVER::Descriptor;

namespace {

constexpr int kFolderFlags = O_RDONLY | O_DIRECTORY | O_CLOEXEC;
constexpr mode_t kMode = S_IRUSR | S_IWUSR;

[[noreturn]] void throwCannot(const std::string& what) {
  throw Failure(ExitCode::kAttention, "cannot " + what + ": " + std::strerror(errno));
}

std::string folderOf(const std::string& path) {
  const std::size_t slash = path.rfind('/');
  if (slash == std::string::npos) return ".";
  return slash == 0 ? "/" : path.substr(0, slash);
}

// The path of an open file that has no name.
std::string procPath(const Descriptor& file) {
  return "/proc/self/fd/" + std::to_string(file.value());
}

std::string temporaryName(const std::string& name) {
  return name + "." + getRandomStr(64).substr(0, 16);
}

sigset_t endingSignals() {
  sigset_t set;
  sigemptyset(&set);
  for (const int signal : {SIGINT, SIGTERM, SIGHUP}) sigaddset(&set, signal);
  return set;
}

bool isInterrupted() {
  sigset_t pending;
  sigpending(&pending);
  return sigismember(&pending, SIGINT) == 1 || sigismember(&pending, SIGTERM) == 1 ||
         sigismember(&pending, SIGHUP) == 1;
}

}  // namespace

NewFile::NewFile(const std::string& path)
    : NewFile(path, Descriptor(open(folderOf(path).c_str(), kFolderFlags)), Existing::kRefuse) {}

NewFile::NewFile(int folder, const std::string& path, Existing existing)
    : NewFile(path, Descriptor(openat(folder, ".", kFolderFlags)), existing) {}

NewFile::NewFile(const std::string& path, Descriptor folder, Existing existing)
    : path_(path),
      name_(nameOf(path)),
      existing_(existing),
      maker_(effectiveIds()),
      folder_(std::move(folder)) {
  if (!folder_.isOpen()) throwCannot("make a file beside " + path_);
  if (existing == Existing::kRefuse) requireFreeName();
  makeUnnamed();
}

NewFile::~NewFile() {
  if (temporary_.empty()) return;
  {
    const ActingAs maker(maker_);
    unlinkat(folder_.value(), temporary_.c_str(), 0);
  }
  sigprocmask(SIG_SETMASK, &signalsBefore_, nullptr);
}

void NewFile::requireFreeName() const {
  struct stat status;
  if (fstatat(folder_.value(), name_.c_str(), &status, AT_SYMLINK_NOFOLLOW) == 0)
    throw Failure(ExitCode::kUsage, path_ + " exists, and no file is ever replaced");
}

// The kernel removes such a file when the process ends. publish() names it through /proc; if there
// is no /proc, makeNamed() makes the file.
void NewFile::makeUnnamed() {
  Descriptor file(openat(folder_.value(), ".", O_TMPFILE | O_RDWR | O_CLOEXEC, kMode));
  struct stat status;
  if (file.isOpen() && stat(procPath(file).c_str(), &status) == 0)
    file_ = std::move(file);
  else if (!file.isOpen() && errno != EOPNOTSUPP && errno != EISDIR && errno != EINVAL)
    throwCannot("make a file beside " + path_);
}

void NewFile::takeTemporaryName() {
  const sigset_t ending = endingSignals();
  sigprocmask(SIG_BLOCK, &ending, &signalsBefore_);
  temporary_ = temporaryName(name_);
}

void NewFile::makeNamed() {
  takeTemporaryName();
  const ActingAs maker(maker_);
  file_ = Descriptor(openat(folder_.value(), temporary_.c_str(),
                            O_RDWR | O_CREAT | O_EXCL | O_NOFOLLOW | O_CLOEXEC, kMode));
  if (!file_.isOpen()) throwCannot("make a file beside " + path_);
}

void NewFile::append(const char* bytes, std::size_t count) {
  if (!file_.isOpen()) makeNamed();
  while (count > 0) {
    const ssize_t written = write(file_.value(), bytes, count);
    if (written < 0 && errno == EINTR) continue;
    if (written <= 0) throwCannot("write " + path_);
    bytes += written;
    count -= static_cast<std::size_t>(written);
  }
}

std::string NewFile::contents() const {
  std::string bytes;
  char block[65536];
  ssize_t count = 0;
  while ((count = pread(file_.value(), block, sizeof block, static_cast<off_t>(bytes.size()))) > 0)
    bytes.append(block, static_cast<std::size_t>(count));
  if (count < 0) throwCannot("read " + path_ + " again");
  return bytes;
}

void NewFile::bringToDisk() const {
  if (fsync(file_.value()) != 0) throwCannot("bring " + path_ + " to the disk");
}

void NewFile::publish() {
  bringToDisk();
  if (!temporary_.empty() && isInterrupted())
    throw Failure(ExitCode::kAttention, "interrupted, " + path_ + " was not made");
  {
    const ActingAs maker(maker_);
    const bool named = existing_ == Existing::kReplace
                           ? replaceExisting()
                           : linkByDescriptor(name_) || (errno != EEXIST && renameTemporary());
    if (!named) {
      if (errno == EEXIST) requireFreeName();
      throwCannot("name the file " + path_);
    }
  }
  if (fsync(folder_.value()) != 0) throwCannot("bring " + path_ + " to the disk");
}

// Uses the descriptor: the temporary name may belong to another file by now.
bool NewFile::linkByDescriptor(const std::string& name) const {
  return linkat(AT_FDCWD, procPath(file_).c_str(), folder_.value(), name.c_str(),
                AT_SYMLINK_FOLLOW) == 0;
}

// For a file system without second names, or a system without /proc.
bool NewFile::renameTemporary() const {
  const int folder = folder_.value();
  const char *const from = temporary_.c_str(), *const to = name_.c_str();
  if (temporary_.empty() || (renameat2(folder, from, folder, to, RENAME_NOREPLACE) != 0 &&
                             linkat(folder, from, folder, to, 0) != 0))
    return false;
  requireOwnName();
  return true;
}

// A link cannot replace a file, so a file without a name gets a temporary one first.
bool NewFile::replaceExisting() {
  if (temporary_.empty()) {
    takeTemporaryName();
    if (!linkByDescriptor(temporary_)) return false;
  }
  const int folder = folder_.value();
  if (renameat(folder, temporary_.c_str(), folder, name_.c_str()) != 0) return false;
  requireOwnName();
  return true;
}

// The temporary name may have belonged to another file.
void NewFile::requireOwnName() const {
  struct stat named, made;
  if (fstatat(folder_.value(), name_.c_str(), &named, AT_SYMLINK_NOFOLLOW) != 0 ||
      fstat(file_.value(), &made) != 0 || named.st_dev != made.st_dev ||
      named.st_ino != made.st_ino)
    throw Failure(ExitCode::kAttention, "somebody put another file in the place of " + path_);
}

}  // namespace oauthctl
