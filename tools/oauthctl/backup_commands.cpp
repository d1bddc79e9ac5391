#include <sys/stat.h>
#include <unistd.h>

#include <cerrno>
#include <cstdlib>
#include <cstring>

#include "commands.h"
#include "database_access.h"
#include "database_image.h"
#include "exit_code.h"
#include "fixed_paths.h"
#include "live_replacement.h"
#include "new_file.h"
#include "terminal.h"

namespace oauthctl {
namespace {

// SQLite takes some names for something else than a file, all of them relative.
std::string absolutePath(const std::string& path) {
  if (path.empty()) throw Failure(ExitCode::kUsage, "FILE is empty");
  if (path.front() == '/') return path;
  char* const folder = getcwd(nullptr, 0);
  if (folder == nullptr)
    throw Failure(ExitCode::kAttention, "cannot tell the folder we are in: give a path from /");
  std::string result = std::string(folder) + "/" + path;
  free(folder);
  return result;
}

std::string firstOf(const Findings& findings) {
  const std::size_t others = findings.size() - 1;
  return findings.front().problem +
         (others == 0 ? "" : " (and " + std::to_string(others) + " more)");
}

DatabaseImage readLive() try {
  return DatabaseImage(fixed_paths::database());
} catch (const SqliteError& error) {
  if (error.isDamage())
    throw Failure(ExitCode::kAttention, fixed_paths::database() + " is damaged (" + error.what() +
                                            "), no backup was made: see 'oauthctl check'");
  throw Failure(ExitCode::kUnavailable,
                error.isBusy() ? "the database is busy, no backup was made: try again"
                               : std::string("cannot read the database (") + error.what() +
                                     "), no backup was made: see 'oauthctl check'");
}

void requireSound(const std::string& path) {
  Findings problems;
  try {
    problems = DatabaseImage(path).problems();
  } catch (const SqliteError& error) {
    problems = {{error.what(), ""}};
  }
  if (!problems.empty())
    throw Failure(ExitCode::kAttention,
                  "the copy is not sound, no backup was made: " + firstOf(problems));
}

[[noreturn]] void refuse(const std::string& path, const std::string& why) {
  throw Failure(ExitCode::kAttention, path + " is refused, nothing changed: " + why);
}

void requireReadableBackup(const std::string& path) {
  struct stat file, live;
  if (stat(path.c_str(), &file) != 0)
    throw Failure(ExitCode::kAttention, "cannot read " + path + ": " + std::strerror(errno));
  if (!S_ISREG(file.st_mode)) refuse(path, "it is not a file");
  if (access(path.c_str(), R_OK) != 0)
    throw Failure(ExitCode::kAttention, "cannot read " + path + ": " + std::strerror(errno));
  if (stat(fixed_paths::database().c_str(), &live) == 0 && live.st_dev == file.st_dev &&
      live.st_ino == file.st_ino)
    throw Failure(ExitCode::kUsage, path + " is the database itself");
}

// The backup, if it is one of this machine.
DatabaseImage readBackup(const std::string& path) try {
  requireReadableBackup(path);
  DatabaseImage image(path);
  const Findings problems = image.problems();
  if (!problems.empty()) refuse(path, firstOf(problems));
  const CipherCount ciphers = image.countCiphers();
  if (ciphers.values > 0 && ciphers.unreadable == ciphers.values)
    refuse(path, "it was encrypted on another machine, or this one has lost its key");
  image.compact();
  return image;
} catch (const SqliteError& error) {
  if (error.isBusy())
    throw Failure(ExitCode::kUnavailable, path + " is busy, nothing changed: try again");
  refuse(path, error.what());
}

}  // namespace

void backUp(const Invocation& invocation) {
  const std::string target = absolutePath(invocation.value("FILE"));
  requireFreeName(target);
  requireDatabase(Access::kRead);
  NewFile file(target);
  std::string summary;
  try {
    DatabaseImage image = readLive();
    if (const Findings problems = image.problems(); !problems.empty())
      throw Failure(ExitCode::kAttention, "the database is not sound, no backup was made: " +
                                              firstOf(problems) + "; see 'oauthctl check'");
    image.compact();
    if (invocation.has("--without-tokens")) image.dropGrants();
    summary = image.summary();
    image.writeTo(file.path());
  } catch (const SqliteError& error) {
    throw Failure(ExitCode::kAttention, "cannot write " + target + ": " + error.what());
  }
  requireSound(file.path());
  file.publish();
  say("wrote " + invocation.value("FILE") + ": " + summary);
}

void restore(const Invocation& invocation) {
  const std::string source = absolutePath(invocation.value("FILE"));
  requireDatabase(Access::kMake);
  DatabaseImage image = readBackup(source);
  if (invocation.has("--without-tokens")) image.dropGrants();
  confirm(invocation, "Replace everything in the database by " + image.summary() + "?");
  const std::string kept = replaceLiveDatabase(image);
  say("restored " + image.summary());
  if (!kept.empty()) say("what was there is kept in " + kept);
}

}  // namespace oauthctl
