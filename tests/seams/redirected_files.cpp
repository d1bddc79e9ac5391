#include "redirected_files.h"

#include <dlfcn.h>
#include <fcntl.h>
#include <sqlite3.h>
#include <sys/random.h>
#include <unistd.h>

#include <algorithm>
#include <cerrno>
#include <cstdarg>
#include <cstdlib>
#include <cstring>
#include <filesystem>
#include <stdexcept>

#include "own_work.h"

namespace {

constexpr char kDatabase[] = "/var/packages/Keyloft/target/etc/oauth.db";
constexpr char kSettings[] = "/var/packages/Keyloft/target/etc/oauth.cfg";
constexpr char kDebugMarker[] = "/tmp/zevooauth_debug";

struct State {
  std::string directory;
  bool temporary = true;
  bool readOnly = false, waitForLocks = false;
  int openCode = SQLITE_OK, closeCode = SQLITE_OK;
  bool failFormatting = false;
  int lookError = 0;
  int randomError = 0, randomCalls = 0;
  unsigned char lastByte = 0;
  bool trickle = false, interrupt = false, randomDevice = true;
  std::vector<std::string> calls;
};
State state;

// In memory if possible: on a busy disk, processes that wait for each other would wait longer than
// a store does.
std::filesystem::path temporaryFiles() {
  constexpr char kMemory[] = "/dev/shm";
  if (std::getenv("TMPDIR") == nullptr && access(kMemory, W_OK) == 0) return kMemory;
  return std::filesystem::temp_directory_path();
}

std::string freshDirectory() {
  std::string name = temporaryFiles() / "zevooauth-test-XXXXXX";
  if (mkdtemp(name.data()) == nullptr) throw std::runtime_error("cannot make " + name);
  return name;
}

// For programs without a fixture.
const std::string& directory() {
  static struct Own {
    ~Own() {
      if (!path.empty()) std::filesystem::remove_all(path);
    }
    std::string path;
  } own;
  if (!state.directory.empty()) return state.directory;
  if (own.path.empty()) own.path = freshDirectory();
  return own.path;
}

std::string redirected(const char* path) {
  if (std::strcmp(path, kDatabase) == 0) return directory() + "/oauth.db";
  if (std::strcmp(path, kSettings) == 0) return directory() + "/oauth.cfg";
  if (std::strcmp(path, kDebugMarker) == 0) return directory() + "/zevooauth_debug";
  return path;
}

template <class Function>
Function* next(const char* name, Function*) {
  return reinterpret_cast<Function*>(dlsym(RTLD_NEXT, name));
}

}  // namespace

RedirectedFiles::RedirectedFiles() {
  state = State();
  state.directory = freshDirectory();
}
RedirectedFiles::RedirectedFiles(const std::string& directory) {
  state = State();
  state.directory = directory;
  state.temporary = false;
}
RedirectedFiles::~RedirectedFiles() {
  if (state.temporary) std::filesystem::remove_all(state.directory);
  state = State();
}

std::string RedirectedFiles::directory() const { return state.directory; }
std::string RedirectedFiles::database() const { return redirected(kDatabase); }
std::string RedirectedFiles::settings() const { return redirected(kSettings); }
std::string RedirectedFiles::debugMarker() const { return redirected(kDebugMarker); }
void RedirectedFiles::removeDirectory() { std::filesystem::remove_all(state.directory); }
void RedirectedFiles::openReadOnly() { state.readOnly = true; }
void RedirectedFiles::failNextLook(int error) { state.lookError = error; }
void RedirectedFiles::openWithoutHandle(int code) { state.openCode = code; }
void RedirectedFiles::waitForLocks() { state.waitForLocks = true; }
void RedirectedFiles::failClose(int code) { state.closeCode = code; }
void RedirectedFiles::failRandomCall(int error, int calls) {
  state.randomError = error;
  state.randomCalls = calls;
}
void RedirectedFiles::trickleRandomBytes() { state.trickle = true; }
void RedirectedFiles::removeRandomDevice() { state.randomDevice = false; }
void RedirectedFiles::failFormatting() { state.failFormatting = true; }
const std::vector<std::string>& RedirectedFiles::calls() const { return state.calls; }

extern "C" int sqlite3_open(const char* path, sqlite3** db) {
  const OwnWork seam;
  state.calls.push_back(std::string("open ") + path);
  if (state.openCode != SQLITE_OK) {
    *db = nullptr;
    return state.openCode;
  }
  const int flags =
      state.readOnly ? SQLITE_OPEN_READONLY : SQLITE_OPEN_READWRITE | SQLITE_OPEN_CREATE;
  return sqlite3_open_v2(redirected(path).c_str(), db, flags, nullptr);
}

// Recorded, and set only on demand: nobody releases a lock in a test of one process.
extern "C" int sqlite3_busy_timeout(sqlite3* db, int milliseconds) {
  const OwnWork seam;
  state.calls.push_back("busy_timeout " + std::to_string(milliseconds));
  return state.waitForLocks ? next("sqlite3_busy_timeout", sqlite3_busy_timeout)(db, milliseconds)
                            : SQLITE_OK;
}

extern "C" int sqlite3_close(sqlite3* db) {
  const OwnWork seam;
  state.calls.emplace_back("close");
  const int code = next("sqlite3_close", sqlite3_close)(db);
  return state.closeCode != SQLITE_OK ? state.closeCode : code;
}

extern "C" char* sqlite3_mprintf(const char* format, ...) {
  if (state.failFormatting) return nullptr;
  va_list arguments;
  va_start(arguments, format);
  char* const text = sqlite3_vmprintf(format, arguments);
  va_end(arguments);
  return text;
}

extern "C" ssize_t getrandom(void* buffer, size_t size, unsigned flags) {
  const OwnWork seam;
  if (state.trickle) state.interrupt = !state.interrupt;
  if (state.interrupt || (state.randomError != 0 && state.randomCalls-- <= 0)) {
    errno = state.interrupt ? EINTR : state.randomError;
    return -1;
  }
  if (!state.trickle) return next("getrandom", getrandom)(buffer, size, flags);
  const size_t count = std::min<size_t>(size, 5);
  for (size_t i = 0; i < count; ++i) static_cast<unsigned char*>(buffer)[i] = ++state.lastByte;
  return static_cast<ssize_t>(count);
}

extern "C" int open64(const char* path, int flags, ...) {
  const OwnWork seam;
  if (!state.randomDevice && std::strcmp(path, "/dev/urandom") == 0) {
    errno = EMFILE;
    return -1;
  }
  if (state.readOnly && (flags & O_CREAT) != 0 && std::strcmp(path, kDatabase) == 0) {
    errno = EACCES;
    return -1;
  }
  va_list arguments;
  va_start(arguments, flags);
  const auto mode = va_arg(arguments, unsigned);  // unused by a call that gives none
  va_end(arguments);
  return next("open64", open64)(redirected(path).c_str(), flags, mode);
}

// lstat() by the names that it has in binaries: with 64-bit offsets, and with 64-bit times on a
// 32-bit machine.
template <class Function>
static int look(Function* system, const char* path, void* out) {
  const OwnWork seam;
  if (state.lookError == 0) return system(redirected(path).c_str(), out);
  errno = state.lookError;
  state.lookError = 0;
  return -1;
}
#define REPLACE_LSTAT(function, symbol)                                 \
  extern "C" int function(const char* path, void* out) __asm__(symbol); \
  extern "C" int function(const char* path, void* out) {                \
    return look(next(symbol, function), path, out);                     \
  }
REPLACE_LSTAT(lstat64Seam, "lstat64")
REPLACE_LSTAT(lstat64Time64Seam, "__lstat64_time64")

extern "C" int access(const char* path, int mode) noexcept {
  const OwnWork seam;
  return next("access", access)(redirected(path).c_str(), mode);
}
