#include "faulty_disk.h"

#include <sqlite3.h>

#include <csignal>
#include <stdexcept>

namespace {

using Call = FaultyDisk::Call;

struct Plan {
  Call call = Call::kOpen;
  int failAfter = -1, code = SQLITE_OK;
  int fullAfter = -1;
  int killAfter = -1;
  int journalRoom = -1;
  bool came = false;
};
Plan plan;

// Counts down to 0 and stays there. -1 means never.
bool reached(int& countdown) { return countdown > 0 && --countdown == 0; }

int answer(Call call) {
  if (call != plan.call || !reached(plan.failAfter)) return SQLITE_OK;
  plan.came = true;
  return plan.code;
}

bool diesNow() { return reached(plan.killAfter); }

void die() { raise(SIGKILL); }

sqlite3_vfs* disk() {
  static sqlite3_vfs* const vfs = sqlite3_vfs_find("unix");
  return vfs;
}

// SQLite's object of an open file, with the real one's right behind it. SQLite aligns it to 8
// bytes.
struct alignas(8) File {
  sqlite3_file base;
  bool isJournal;
};
sqlite3_file* real(sqlite3_file* file) {
  return reinterpret_cast<sqlite3_file*>(reinterpret_cast<File*>(file) + 1);
}
const sqlite3_io_methods& methods(sqlite3_file* file) { return *real(file)->pMethods; }

int closeFile(sqlite3_file* file) { return methods(file).xClose(real(file)); }

int readFile(sqlite3_file* file, void* out, int size, sqlite3_int64 offset) {
  const int code = answer(Call::kRead);
  return code != SQLITE_OK ? code : methods(file).xRead(real(file), out, size, offset);
}

int writeFile(sqlite3_file* file, const void* data, int size, sqlite3_int64 offset) {
  if (diesNow()) {
    methods(file).xWrite(real(file), data, size / 2, offset);
    die();
  }
  const int code = answer(Call::kWrite);
  if (code != SQLITE_OK) return code;
  const bool isJournal = reinterpret_cast<File*>(file)->isJournal;
  const bool fits = plan.journalRoom < 0 || offset + size <= plan.journalRoom;
  if (plan.fullAfter == 0 || (isJournal && !fits)) {
    plan.came = true;
    return SQLITE_FULL;
  }
  if (plan.fullAfter > 0) --plan.fullAfter;
  return methods(file).xWrite(real(file), data, size, offset);
}

int truncateFile(sqlite3_file* file, sqlite3_int64 size) {
  if (diesNow()) die();
  const int code = answer(Call::kTruncate);
  return code != SQLITE_OK ? code : methods(file).xTruncate(real(file), size);
}

int syncFile(sqlite3_file* /*file*/, int /*flags*/) {
  if (diesNow()) die();
  return answer(Call::kSync);
}

int fileSize(sqlite3_file* file, sqlite3_int64* size) {
  return methods(file).xFileSize(real(file), size);
}

int lockFile(sqlite3_file* file, int level) {
  const int code = answer(Call::kLock);
  return code != SQLITE_OK ? code : methods(file).xLock(real(file), level);
}

int unlockFile(sqlite3_file* file, int level) { return methods(file).xUnlock(real(file), level); }

int checkReserved(sqlite3_file* file, int* result) {
  return methods(file).xCheckReservedLock(real(file), result);
}

int controlFile(sqlite3_file* file, int operation, void* argument) {
  return methods(file).xFileControl(real(file), operation, argument);
}

int sectorSize(sqlite3_file* file) { return methods(file).xSectorSize(real(file)); }

int characteristics(sqlite3_file* file) { return methods(file).xDeviceCharacteristics(real(file)); }

// Version 1 has neither shared memory nor memory maps; a rollback journal does not need them.
const sqlite3_io_methods ioMethods = {
    1,        closeFile,  readFile,      writeFile,   truncateFile, syncFile,        fileSize,
    lockFile, unlockFile, checkReserved, controlFile, sectorSize,   characteristics, nullptr,
    nullptr,  nullptr,    nullptr,       nullptr,     nullptr};

int openFile(sqlite3_vfs* /*vfs*/, const char* path, sqlite3_file* file, int flags, int* flagsOut) {
  file->pMethods = nullptr;
  reinterpret_cast<File*>(file)->isJournal = (flags & SQLITE_OPEN_MAIN_JOURNAL) != 0;
  int code = answer(Call::kOpen);
  if (code == SQLITE_OK) code = disk()->xOpen(disk(), path, real(file), flags, flagsOut);
  if (code == SQLITE_OK) file->pMethods = &ioMethods;
  return code;
}

int deleteFile(sqlite3_vfs* /*vfs*/, const char* path, int /*syncDirectory*/) {
  if (diesNow()) die();
  const int code = answer(Call::kDelete);
  return code != SQLITE_OK ? code : disk()->xDelete(disk(), path, 0);
}

sqlite3_vfs* faulty() {
  static sqlite3_vfs vfs = [] {
    sqlite3_vfs made = *disk();
    made.szOsFile = static_cast<int>(sizeof(File)) + disk()->szOsFile;
    made.zName = "faulty";
    made.xOpen = openFile;
    made.xDelete = deleteFile;
    return made;
  }();
  return &vfs;
}

}  // namespace

FaultyDisk::FaultyDisk() {
  plan = Plan();
  if (sqlite3_vfs_register(faulty(), 1) != SQLITE_OK) throw std::runtime_error("no file system");
}
FaultyDisk::~FaultyDisk() { sqlite3_vfs_unregister(faulty()); }

void FaultyDisk::fail(Call call, int nth, int code) {
  plan = Plan();
  plan.call = call;
  plan.failAfter = nth;
  plan.code = code;
}
void FaultyDisk::fillAfter(int writes) {
  plan = Plan();
  plan.fullAfter = writes;
}
void FaultyDisk::limitJournal(int bytes) {
  plan = Plan();
  plan.journalRoom = bytes;
}
void FaultyDisk::killAt(int nth) {
  plan = Plan();
  plan.killAfter = nth;
}
bool FaultyDisk::mend() {
  const bool came = plan.came;
  plan = Plan();
  return came;
}
