#include "sandbox.h"

#include <dlfcn.h>
#include <fcntl.h>
#include <sqlite3.h>
#include <syslog.h>
#include <unistd.h>

#include <cstdarg>
#include <cstdint>
#include <cstdio>
#include <cstdlib>
#include <cstring>
#include <ctime>
#include <filesystem>
#include <fstream>
#include <stdexcept>
#include <vector>

#include "host_libraries.h"
#include "oauth_db_basic.h"
#include "oauth_names.h"
#include "oauth_utils.h"

namespace names = ZEVOOAUTHSERVER::names;

namespace {

constexpr char kEntropyDevice[] = "/dev/urandom";

std::string directory, database, settings, entropy;
bool entropyIsFixed = false;

[[noreturn]] void fail(const std::string& what) { throw std::runtime_error("cannot " + what); }

// Returns 64 hexadecimal digits that look random.
std::string secret(std::uint64_t table, std::uint64_t row) {
  std::string digits;
  std::uint64_t state = (table << 32) + 4 * row;
  for (int word = 0; word < 4; ++word) {
    std::uint64_t mixed = ++state * 0x9e3779b97f4a7c15;
    mixed = (mixed ^ (mixed >> 30)) * 0xbf58476d1ce4e5b9;
    mixed = (mixed ^ (mixed >> 27)) * 0x94d049bb133111eb;
    char text[17];
    std::snprintf(text, sizeof text, "%016llx",
                  static_cast<unsigned long long>(mixed ^ (mixed >> 31)));
    digits += text;
  }
  return digits;
}

std::string clientId(int row) { return secret(3, static_cast<std::uint64_t>(row)); }

// Fills tables with rows.
class Filler {
 public:
  explicit Filler(const std::string& path) {
    if (sqlite3_open_v2(path.c_str(), &db_, SQLITE_OPEN_READWRITE, nullptr) != SQLITE_OK)
      fail("open " + path);
    run("BEGIN;");
  }
  ~Filler() { sqlite3_close(db_); }
  Filler(const Filler&) = delete;
  Filler& operator=(const Filler&) = delete;

  // Adds count rows. values(row) gives the columns of a row in the table's order, without the id.
  template <class Values>
  void fill(const char* table, int count, Values values) {
    for (int row = 0; row < count; ++row) {
      std::string sql = std::string("INSERT INTO ") + table + " VALUES(";
      for (const std::string& value : values(row)) sql += "'" + value + "', ";
      run(sql + "NULL);");
    }
  }
  void commit() { run("COMMIT;"); }

 private:
  void run(const std::string& sql) {
    if (sqlite3_exec(db_, sql.c_str(), nullptr, nullptr, nullptr) != SQLITE_OK)
      fail("run " + sql + ": " + sqlite3_errmsg(db_));
  }

  sqlite3* db_ = nullptr;
};

void fillTables(const Rows& rows) {
  using Values = std::vector<std::string>;
  const std::string now = std::to_string(std::time(nullptr));
  const std::string later = std::to_string(std::time(nullptr) + 1'000'000);
  const std::string state = "af0ifjsldkj-5f3c9d1b7e2a4860";
  Filler filler(database);
  const auto user = [](int row) { return "user" + std::to_string(row); };
  filler.fill(names::table::kToken, rows.tokens, [&](int row) {
    // Expired and valid tokens alternate until all expired ones are there.
    const bool expired = row % 2 == 0 && row / 2 < rows.expiredTokens;
    return Values{user(row),        clientId(row % 50),
                  "read write",     refreshToken(row),
                  accessToken(row), expired ? "1500000000" : later,
                  "code",           state,
                  "192.0.2.7"};
  });
  filler.fill(names::table::kLog, rows.logLines, [&](int row) {
    const std::time_t when = std::time(nullptr) - 60 - rows.logLines + row;
    return Values{std::to_string(when), "Application registed[" + user(row) + "]"};
  });
  filler.commit();
}

// Writes the copy to the disk, so that no such write happens during a measurement.
void copy(const std::string& from, const std::string& to) {
  std::filesystem::copy_file(from, to, std::filesystem::copy_options::overwrite_existing);
  const int file = open(to.c_str(), O_RDWR | O_CLOEXEC);
  if (file < 0 || fsync(file) != 0) fail("write " + to);
  close(file);
}

template <class Function>
Function* next(const char* name, Function*) {
  return reinterpret_cast<Function*>(dlsym(RTLD_NEXT, name));
}

// The path under which the file is really opened. The database is not here, because only SQLite
// opens it, and sqlite3_open() is replaced below.
const char* redirected(const char* path) {
  if (std::strcmp(path, names::path::kSettings) == 0) return settings.c_str();
  if (entropyIsFixed && std::strcmp(path, kEntropyDevice) == 0) return entropy.c_str();
  return path;
}

}  // namespace

std::string accessToken(int row) { return secret(1, static_cast<std::uint64_t>(row)); }
std::string refreshToken(int row) { return secret(2, static_cast<std::uint64_t>(row)); }

Sandbox::Sandbox() {
  // Each thread decides this once. Decide it here, before all measurements.
  if (ZEVOOAUTHSERVER::isDebugEnabled())
    fail(std::string("measure while diagnostics are on: ") + names::path::kDebugMarker);
  // /tmp may be in memory, so use a folder on a disk. The path has the same depth on every machine,
  // because SQLite looks at each part of it.
  char path[] = "/var/tmp/zevooauth-bench-XXXXXX";
  if (mkdtemp(path) == nullptr) fail(std::string("make ") + path);
  directory = path;
  database = directory + "/oauth.db";
  settings = directory + "/oauth.cfg";
  entropy = directory + "/entropy";
  std::ofstream(settings) << "{\n  \"client_info_max\": " << kRowMax
                          << ",\n  \"grantcode_expired\": 600,\n  \"grantcode_max\": " << kRowMax
                          << ",\n  \"log_level\": 0,\n  \"log_max\": " << kLogMax
                          << ",\n  \"token_expired\": 600,\n  \"token_max\": " << kRowMax
                          << "\n}\n";
  std::ofstream(entropy) << std::string(64, 'z');
}

void Sandbox::fixEntropy() { entropyIsFixed = true; }

Sandbox::~Sandbox() { std::filesystem::remove_all(directory); }

void Sandbox::layOut(const Rows& rows) {
  const std::string made = directory + "/tokens" + std::to_string(rows.tokens) + "-expired" +
                           std::to_string(rows.expiredTokens) + "-log" +
                           std::to_string(rows.logLines) + ".db";
  if (!std::filesystem::exists(made)) {
    std::filesystem::remove(database);
    { const ZEVOOAUTHSERVER::OAUTHDBBasic schema; }
    fillTables(rows);
    copy(database, made);
  }
  copy(made, database);
}

int Sandbox::count(const char* table) const {
  sqlite3* db = nullptr;
  sqlite3_stmt* statement = nullptr;
  int rows = -1;
  const std::string sql = std::string("SELECT COUNT(*) FROM ") + table;
  if (sqlite3_open_v2(database.c_str(), &db, SQLITE_OPEN_READONLY, nullptr) == SQLITE_OK &&
      sqlite3_prepare_v2(db, sql.c_str(), -1, &statement, nullptr) == SQLITE_OK &&
      sqlite3_step(statement) == SQLITE_ROW)
    rows = sqlite3_column_int(statement, 0);
  sqlite3_finalize(statement);
  sqlite3_close(db);
  return rows;
}

extern "C" int sqlite3_open(const char* /*path*/, sqlite3** db) {
  return sqlite3_open_v2(database.c_str(), db, SQLITE_OPEN_READWRITE | SQLITE_OPEN_CREATE, nullptr);
}

extern "C" FILE* fopen64(const char* path, const char* mode) {
  static const auto real = next("fopen64", fopen64);
  return real(redirected(path), mode);
}

extern "C" int open64(const char* path, int flags, ...) {
  static const auto real = next("open64", open64);
  va_list arguments;
  va_start(arguments, flags);
  const auto mode = va_arg(arguments, unsigned);  // unused if the call gives no mode
  va_end(arguments);
  return real(redirected(path), flags, mode);
}

// This cipher costs almost nothing: the library is measured, not the host's cipher.
extern "C" int ZOCLCryptSzEncrypt(const char* plain, char* out, int outSize) {
  const std::size_t size = std::strlen(plain) + 1;
  if (size > static_cast<std::size_t>(outSize)) return 0;
  std::memcpy(out, plain, size);
  return 1;
}
extern "C" int ZOCLCryptSzDecrypt(const char* cipher, char* out, int outSize) {
  return ZOCLCryptSzEncrypt(cipher, out, outSize);
}

extern "C" void syslog(int, const char*, ...) {}
// The compiler calls this one instead if _FORTIFY_SOURCE is set.
extern "C" void __syslog_chk(int, int, const char*, ...) {}
