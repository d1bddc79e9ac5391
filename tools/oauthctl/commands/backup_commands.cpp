#include <utility>

#include "backup_file.h"
#include "commands.h"
#include "database_access.h"
#include "database_folder.h"
#include "database_image.h"
#include "exit_code.h"
#include "fixed_paths.h"
#include "live_replacement.h"
#include "new_file.h"
#include "terminal.h"

namespace oauthctl {
namespace {

std::string operand(const Invocation& invocation) {
  std::string path = invocation.value("FILE");
  if (path.empty()) throw Failure(ExitCode::kUsage, "FILE is empty");
  return path;
}

std::string firstOf(const Findings& findings) {
  const std::size_t others = findings.size() - 1;
  return findings.front().problem +
         (others == 0 ? "" : " (and " + std::to_string(others) + " more)");
}

DatabaseImage readLive() try {
  return DatabaseImage::ofFile(fixed_paths::database());
} catch (const SqliteError& error) {
  if (error.isDamage())
    throw Failure(ExitCode::kAttention, fixed_paths::database() + " is damaged (" + error.what() +
                                            "), no backup was made: see 'oauthctl check'");
  throw Failure(ExitCode::kUnavailable,
                error.isBusy() ? "the database is busy, no backup was made: try again"
                               : std::string("cannot read the database (") + error.what() +
                                     "), no backup was made: see 'oauthctl check'");
}

// Reads the new file back and checks that it is a sound database.
void requireSound(const NewFile& file) {
  Findings problems;
  try {
    problems = DatabaseImage::ofBytes(file.contents()).problems();
  } catch (const SqliteError& error) {
    problems = {{error.what(), ""}};
  }
  if (!problems.empty())
    throw Failure(ExitCode::kAttention,
                  "the copy is not sound, no backup was made: " + firstOf(problems));
}

void refuseTheDatabaseItself(const BackupFile& backup, const std::string& path) {
  const auto live = DatabaseFolder::enter().look(nameOf(fixed_paths::database()));
  if (live && live->st_dev == backup.status.st_dev && live->st_ino == backup.status.st_ino)
    throw Failure(ExitCode::kUsage, path + " is the database itself");
}

// The image of the backup, if it is one of this machine.
DatabaseImage imageOf(BackupFile backup, const std::string& path) try {
  DatabaseImage image = DatabaseImage::ofBytes(std::move(backup.bytes));
  const Findings problems = image.problems();
  if (!problems.empty()) refuseBackup(path, firstOf(problems));
  const CipherCount ciphers = image.countCiphers();
  if (ciphers.values > 0 && ciphers.unreadable == ciphers.values)
    refuseBackup(path, "it was encrypted on another machine, or this one has lost its key");
  image.compact();
  return image;
} catch (const SqliteError& error) {
  refuseBackup(path, error.what());
}

DatabaseImage liveImage(bool withoutTokens) {
  DatabaseImage image = readLive();
  if (const Findings problems = image.problems(); !problems.empty())
    throw Failure(ExitCode::kAttention, "the database is not sound, no backup was made: " +
                                            firstOf(problems) + "; see 'oauthctl check'");
  image.compact();
  if (withoutTokens) image.dropGrants();
  return image;
}

}  // namespace

// The file is the operator's: it is made before root becomes the owner of the database's folder.
void backUp(const Invocation& invocation) {
  const std::string target = operand(invocation);
  NewFile file(target);
  DatabaseFolder::enter(Return::kByActingAs);  // The file gets its name with the operator's ids.
  requireDatabase(Access::kRead);
  DatabaseImage image = liveImage(invocation.has("--without-tokens"));
  file.append(image.bytes());
  requireSound(file);
  file.publish();
  say("wrote " + target + ": " + image.summary());
}

// The backup is read before root takes the owner's ids: it is the operator's.
void restore(const Invocation& invocation) {
  const std::string source = operand(invocation);
  BackupFile backup = readBackupFile(source);
  requireDatabase(Access::kMake);
  refuseTheDatabaseItself(backup, source);
  DatabaseImage image = imageOf(std::move(backup), source);
  if (invocation.has("--without-tokens")) image.dropGrants();
  confirm(invocation, "Replace everything in the database by " + image.summary() + "?");
  const std::string kept = replaceLiveDatabase(image);
  say("restored " + image.summary());
  if (!kept.empty()) say("what was there is kept in " + kept);
}

}  // namespace oauthctl
