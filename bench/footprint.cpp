// Counts what every operation needs from the machine. Prints one line for each, with tabs:
//
//   <operation>/<side>  disk syncs  allocations  bytes of memory at the peak
//
// The last line is for comparison with the peak of reading all rows:
//
//   text of 10000 rows  bytes

#include <json/writer.h>
#include <malloc.h>
#include <sys/syscall.h>
#include <unistd.h>

#include <algorithm>
#include <cstddef>
#include <iostream>
#include <stdexcept>

#include "oauth_names.h"
#include "oauth_token.h"
#include "operations.h"

extern "C" {
// NOLINTBEGIN(bugprone-reserved-identifier): the C library gives these names
void* __libc_malloc(std::size_t size) noexcept;
void* __libc_calloc(std::size_t count, std::size_t size) noexcept;
void* __libc_realloc(void* block, std::size_t size) noexcept;
void __libc_free(void* block) noexcept;
// NOLINTEND(bugprone-reserved-identifier)
}

namespace {

struct Footprint {
  long syncs = 0, allocations = 0;
  std::ptrdiff_t memory = 0, peak = 0;  // bytes more than at the beginning
};
Footprint now;

void* counted(void* block) {
  ++now.allocations;
  now.memory += static_cast<std::ptrdiff_t>(malloc_usable_size(block));
  now.peak = std::max(now.peak, now.memory);
  return block;
}
void countFreed(void* block) {
  now.memory -= static_cast<std::ptrdiff_t>(malloc_usable_size(block));
}

Footprint measured(const std::function<bool()>& run, bool& done) {
  now = Footprint();
  done = run();
  return now;
}

void print(Sandbox& sandbox, const Operation& operation, const Side& side) {
  sandbox.layOut(operation.rows);
  const Work work = side.prepare();
  Footprint footprint;
  for (int i = 0; i < 2; ++i)  // the first run makes what is made only once
    runOnce(sandbox, operation, work, [&footprint](const std::function<bool()>& run) {
      bool done = false;
      footprint = measured(run, done);
      return done;
    });
  std::cout << operation.name << '/' << side.name << '\t' << footprint.syncs << '\t'
            << footprint.allocations << '\t' << footprint.peak << '\n';
}

// Returns the size of the rows as a JSON text without blanks.
std::size_t textOfRows(Sandbox& sandbox, int rows) {
  Rows tokens;
  tokens.tokens = rows;
  sandbox.layOut(tokens);
  Json::Value all;
  ZEVOOAUTHSERVER::OAUTHDBToken(ZEVOOAUTHSERVER::names::table::kToken).Get(&all);
  Json::StreamWriterBuilder writer;
  writer["indentation"] = "";
  return Json::writeString(writer, all).size();
}

}  // namespace

int main() try {
  Sandbox sandbox;
  for (const Operation& operation : operations())
    for (const Side& side : operation.sides) print(sandbox, operation, side);
  std::cout << "text of 10000 rows\t" << textOfRows(sandbox, 10000) << '\n';
} catch (const std::exception& error) {
  std::cerr << "footprint: " << error.what() << '\n';
  return 1;
}

extern "C" void* malloc(std::size_t size) noexcept { return counted(__libc_malloc(size)); }
extern "C" void* calloc(std::size_t count, std::size_t size) noexcept {
  return counted(__libc_calloc(count, size));
}
extern "C" void* realloc(void* block, std::size_t size) noexcept {
  countFreed(block);
  return counted(__libc_realloc(block, size));
}
extern "C" void free(void* block) noexcept {
  countFreed(block);
  __libc_free(block);
}

extern "C" int fsync(int file) {
  ++now.syncs;
  return static_cast<int>(syscall(SYS_fsync, file));
}
extern "C" int fdatasync(int file) {
  ++now.syncs;
  return static_cast<int>(syscall(SYS_fdatasync, file));
}
