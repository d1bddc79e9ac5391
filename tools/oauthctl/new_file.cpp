#include "new_file.h"

#include <fcntl.h>
#include <sys/stat.h>
#include <unistd.h>

#include <cerrno>
#include <csignal>
#include <cstdio>
#include <cstdlib>
#include <cstring>

#include "exit_code.h"

namespace oauthctl {
namespace {

[[noreturn]] void cannot(const std::string& what) {
  throw Failure(ExitCode::kAttention, "cannot " + what + ": " + std::strerror(errno));
}

// What the signal handler removes; it may hold secrets.
char unfinished[4096];

void removeUnfinished(int signal) {
  unlink(unfinished);
  std::signal(signal, SIG_DFL);
  raise(signal);
}

void removeOnSignals(const std::string& path) {
  if (path.size() >= sizeof unfinished) return;
  unfinished[path.copy(unfinished, path.size())] = '\0';
  for (const int signal : {SIGINT, SIGTERM, SIGHUP}) std::signal(signal, removeUnfinished);
}

// Makes a file like mkostemp. No signal finds it made and not yet known to the handler.
bool makeRemovable(std::string& path) {
  sigset_t held, before;
  sigemptyset(&held);
  for (const int signal : {SIGINT, SIGTERM, SIGHUP}) sigaddset(&held, signal);
  sigprocmask(SIG_BLOCK, &held, &before);
  const int descriptor = mkostemp(path.data(), O_CLOEXEC);
  if (descriptor >= 0) {
    close(descriptor);
    removeOnSignals(path);
  }
  const int error = errno;
  sigprocmask(SIG_SETMASK, &before, nullptr);
  errno = error;
  return descriptor >= 0;
}

void restoreSignals() {
  for (const int signal : {SIGINT, SIGTERM, SIGHUP}) std::signal(signal, SIG_DFL);
}

void synchronize(const std::string& path, int flags) {
  const int descriptor = open(path.c_str(), O_RDONLY | O_CLOEXEC | flags);
  const bool done = descriptor >= 0 && fsync(descriptor) == 0;
  if (!done) cannot("bring " + path + " to the disk");
  close(descriptor);
}

}  // namespace

std::string folderOf(const std::string& path) {
  const std::size_t slash = path.rfind('/');
  if (slash == std::string::npos) return ".";
  return slash == 0 ? "/" : path.substr(0, slash);
}

void requireFreeName(const std::string& path) {
  struct stat status;
  if (lstat(path.c_str(), &status) == 0)
    throw Failure(ExitCode::kUsage, path + " exists, and no file is ever replaced");
}

NewFile::NewFile(const std::string& target) : target_(target), path_(target + ".XXXXXX") {
  requireFreeName(target);
  if (!makeRemovable(path_)) cannot("make a file beside " + target);
}

NewFile::~NewFile() {
  if (path_.empty()) return;
  unlink(path_.c_str());
  restoreSignals();
}

void NewFile::publish() {
  synchronize(path_, 0);
  bool named = renameat2(AT_FDCWD, path_.c_str(), AT_FDCWD, target_.c_str(), RENAME_NOREPLACE) == 0;
  if (!named && (errno == EINVAL || errno == ENOSYS)) {
    // An older kernel or file system: a second name does the same.
    named = link(path_.c_str(), target_.c_str()) == 0;
    if (named) unlink(path_.c_str());
  }
  if (!named && errno == EEXIST) requireFreeName(target_);
  if (!named) cannot("name the file " + target_);
  restoreSignals();
  path_.clear();
  synchronize(folderOf(target_), O_DIRECTORY);
}

}  // namespace oauthctl
