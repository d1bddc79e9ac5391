#include "scarce_memory.h"

#include <sqlite3.h>
#include <unistd.h>

#include <cstddef>
#include <cstdlib>
#include <new>

#include "own_work.h"

// The malloc() of the C library.
extern "C" void* libcMalloc(std::size_t size) __asm__("__libc_malloc");

namespace {

int sqliteCountdown = -1, cppCountdown = -1;
bool came = false;
int asRoot = 0;

bool refuses(int& countdown) {
  if (countdown <= 0 || --countdown > 0) return false;
  came = true;
  return true;
}

bool refusesCpp() { return !OwnWork::isUnderWay() && refuses(cppCountdown); }

// SQLite's requests, refused before its own allocator sees them.
sqlite3_mem_methods sqliteMemory;

void* sqliteMalloc(int size) {
  if (refuses(sqliteCountdown)) return nullptr;
  const OwnWork notCpp;
  return sqliteMemory.xMalloc(size);
}

void* sqliteRealloc(void* block, int size) {
  if (refuses(sqliteCountdown)) return nullptr;
  const OwnWork notCpp;
  return sqliteMemory.xRealloc(block, size);
}

[[gnu::constructor]] void replaceSqliteMemory() {
  sqlite3_config(SQLITE_CONFIG_GETMALLOC, &sqliteMemory);
  sqlite3_mem_methods replaced = sqliteMemory;
  replaced.xMalloc = sqliteMalloc;
  replaced.xRealloc = sqliteRealloc;
  if (sqlite3_config(SQLITE_CONFIG_MALLOC, &replaced) != SQLITE_OK) std::abort();
}

}  // namespace

ScarceMemory::~ScarceMemory() { refill(); }
void ScarceMemory::refuseSqlite(int nth) { sqliteCountdown = nth; }
void ScarceMemory::refuseCpp(int nth) { cppCountdown = nth; }
bool ScarceMemory::refill() {
  const bool did = came;
  sqliteCountdown = cppCountdown = -1;
  came = false;
  return did;
}
int ScarceMemory::requestsAsRoot() const { return asRoot; }

// The address sanitizer has its own malloc(). With it only operator new is refused, else both.
#ifdef __SANITIZE_ADDRESS__
namespace {
void* request(std::size_t size) { return refusesCpp() ? nullptr : std::malloc(size); }
}  // namespace
#else
extern "C" void* malloc(std::size_t size) noexcept {
  return refusesCpp() ? nullptr : libcMalloc(size);
}
namespace {
void* request(std::size_t size) { return std::malloc(size); }
}  // namespace
#endif

void* operator new(std::size_t size) {
  if (!OwnWork::isUnderWay() && geteuid() == 0) ++asRoot;
  void* const block = request(size == 0 ? 1 : size);
  if (block == nullptr) throw std::bad_alloc();
  return block;
}
void operator delete(void* block) noexcept { std::free(block); }
void operator delete(void* block, std::size_t) noexcept { std::free(block); }
