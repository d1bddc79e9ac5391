// Replaces the fixed paths in a test build of oauthctl. All files are in the folder
// OAUTHCTL_FOLDER, the clock stands at OAUTHCTL_NOW, and a process of root becomes the user
// OAUTHCTL_USER, if those variables are set.

#include <dlfcn.h>
#include <fcntl.h>
#include <grp.h>
#include <sqlite3.h>
#include <sys/prctl.h>
#include <sys/stat.h>
#include <sys/time.h>
#include <unistd.h>

#include <cerrno>
#include <csignal>
#include <cstdarg>
#include <cstdio>
#include <cstdlib>
#include <cstring>
#include <ctime>
#include <string>

#include "database/fixed_paths.h"
#include "oauth_names.h"

namespace oauthctl::fixed_paths {

std::string folder() {
  const char* const name = std::getenv("OAUTHCTL_FOLDER");
  return name == nullptr ? "/nonexistent" : name;
}
std::string database() { return folder() + "/oauth.db"; }
std::string settings() { return folder() + "/oauth.cfg"; }
std::string debugMarker() { return folder() + "/zevooauth_debug"; }

}  // namespace oauthctl::fixed_paths

namespace {

namespace installed = ZEVOOAUTHSERVER::names::path;

// Redirects the fixed paths of the library.
std::string redirected(const char* path) {
  using namespace oauthctl::fixed_paths;
  if (std::strcmp(path, installed::kDebugMarker) == 0) return debugMarker();
  if (std::strncmp(path, installed::kFolder, std::strlen(installed::kFolder)) == 0)
    return folder() + (path + std::strlen(installed::kFolder));
  return path;
}

std::time_t now() {
  const char* const fixed = std::getenv("OAUTHCTL_NOW");
  timespec real;
  clock_gettime(CLOCK_REALTIME, &real);
  return fixed == nullptr ? real.tv_sec : static_cast<std::time_t>(std::atoll(fixed));
}

// Runs before main(), but after root has loaded the program: the user may not have access to the
// program's folder. The process then looks as if that user had started it.
[[gnu::constructor]] void becomeUser() {
  const char* const user = std::getenv("OAUTHCTL_USER");
  if (user == nullptr) return;
  const auto id = static_cast<unsigned>(std::atoi(user));
  if (setgroups(0, nullptr) != 0 || setgid(id) != 0 || setuid(id) != 0 ||
      prctl(PR_SET_DUMPABLE, 1) != 0)
    _exit(99);
}

template <class Function>
Function* next(const char* name, Function*) {
  return reinterpret_cast<Function*>(dlsym(RTLD_NEXT, name));
}

}  // namespace

// With OAUTHCTL_SWAP, renames that file to the database's name first, as an attacker could.
extern "C" int sqlite3_open(const char* path, sqlite3** db) {
  if (const char* const swap = std::getenv("OAUTHCTL_SWAP"); swap != nullptr)
    static_cast<void>(std::rename(swap, redirected(path).c_str()));
  return sqlite3_open_v2(redirected(path).c_str(), db, SQLITE_OPEN_READWRITE | SQLITE_OPEN_CREATE,
                         nullptr);
}

extern "C" int open64(const char* path, int flags, ...) {
  va_list arguments;
  va_start(arguments, flags);
  const auto mode = va_arg(arguments, unsigned);  // not used if the caller gave none
  va_end(arguments);
  return next("open64", open64)(redirected(path).c_str(), flags, mode);
}

// The names of lstat() in binaries: with 64-bit offsets, and with 64-bit times on a 32-bit machine.
#define REPLACE_LSTAT(function, symbol)                                 \
  extern "C" int function(const char* path, void* out) __asm__(symbol); \
  extern "C" int function(const char* path, void* out) {                \
    return next(symbol, function)(redirected(path).c_str(), out);       \
  }
REPLACE_LSTAT(lstat64Seam, "lstat64")
REPLACE_LSTAT(lstat64Time64Seam, "__lstat64_time64")

// With OAUTHCTL_NO_TMPFILE, behaves like a file system without unnamed files.
extern "C" int openat64(int folder, const char* path, int flags, ...) {
  va_list arguments;
  va_start(arguments, flags);
  const auto mode = va_arg(arguments, unsigned);
  va_end(arguments);
  if ((flags & O_TMPFILE) == O_TMPFILE && std::getenv("OAUTHCTL_NO_TMPFILE") != nullptr) {
    errno = EOPNOTSUPP;
    return -1;
  }
  return next("openat64", openat64)(folder, path, flags, mode);
}

// With OAUTHCTL_NO_PROC, behaves as if /proc were not mounted.
extern "C" int linkat(int from, const char* path, int to, const char* name, int flags) noexcept {
  if (std::getenv("OAUTHCTL_NO_PROC") != nullptr && std::strncmp(path, "/proc/", 6) == 0) {
    errno = ENOENT;
    return -1;
  }
  return next("linkat", linkat)(from, path, to, name, flags);
}

// With OAUTHCTL_FULL_DISK, behaves as if the disk were full.
extern "C" ssize_t write(int descriptor, const void* bytes, std::size_t count) {
  struct stat status;
  if (std::getenv("OAUTHCTL_FULL_DISK") != nullptr && fstat(descriptor, &status) == 0 &&
      S_ISREG(status.st_mode)) {
    errno = ENOSPC;
    return -1;
  }
  return next("write", write)(descriptor, bytes, count);
}

// Runs after a file is written and before it is named: waits for the file OAUTHCTL_HOLD, if that is
// set, and interrupts the program if OAUTHCTL_INTERRUPT is set.
extern "C" int fsync(int descriptor) {
  const char* const hold = std::getenv("OAUTHCTL_HOLD");
  while (hold != nullptr && faccessat(AT_FDCWD, hold, F_OK, 0) != 0) usleep(1000);
  if (std::getenv("OAUTHCTL_INTERRUPT") != nullptr) raise(SIGINT);
  return next("fsync", fsync)(descriptor);
}

extern "C" int access(const char* path, int mode) noexcept {
  return next("access", access)(redirected(path).c_str(), mode);
}

extern "C" time_t time(time_t* out) noexcept {
  const std::time_t moment = now();
  if (out != nullptr) *out = moment;
  return moment;
}

// SQLite's clock, which gives the time of a line in the audit log.
extern "C" int gettimeofday(timeval* out, void*) noexcept {
  *out = {};
  out->tv_sec = now();
  return 0;
}
