#include <utility>

#include "checks/content_checks.h"
#include "commands/commands.h"
#include "database/access.h"
#include "database/backup_file.h"
#include "database/fixed_paths.h"
#include "database/folder.h"
#include "database/image.h"
#include "database/live_replacement.h"
#include "database/new_file.h"
#include "terminal/exit_code.h"
#include "terminal/terminal.h"

namespace oauthctl {
namespace {

std::string fileOperand(const Invocation& invocation) {
  std::string path = invocation.value("FILE");
  if (path.empty()) throw Failure(ExitCode::kUsage, "FILE is empty");
  return path;
}

std::string summaryOf(const Findings& findings) {
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
  throwUnavailable(error.isBusy() ? "the database is busy, no backup was made: try again"
                                  : std::string("cannot read the database (") + error.what() +
                                        "), no backup was made: see 'oauthctl check'");
}

// Reads the new file back and checks that it is a sound database.
void requireSound(const NewFile& file) {
  Findings problems;
  try {
    DatabaseImage copy = DatabaseImage::ofBytes(file.contents());
    problems = checkStructure(copy.connection());
  } catch (const SqliteError& error) {
    problems = {{error.what(), ""}};
  }
  if (!problems.empty())
    throw Failure(ExitCode::kAttention,
                  "the copy is not sound, no backup was made: " + summaryOf(problems));
}

void requireAnotherFile(const BackupFile& backup, const std::string& path) {
  const auto live = DatabaseFolder::enter().lstatOf(nameOf(fixed_paths::database()));
  if (live && live->st_dev == backup.status.st_dev && live->st_ino == backup.status.st_ino)
    throw Failure(ExitCode::kUsage, path + " is the database itself");
}

// The image of the backup. Throws unless the backup is sound and of this machine.
DatabaseImage imageOf(BackupFile backup, const std::string& path) try {
  DatabaseImage image = DatabaseImage::ofBytes(std::move(backup.bytes));
  const Findings problems = checkStructure(image.connection());
  if (!problems.empty()) refuseBackup(path, summaryOf(problems));
  CipherCount ciphers;
  checkCiphers(image.connection(), ciphers);
  if (ciphers.values > 0 && ciphers.unreadable == ciphers.values)
    refuseBackup(path, "it was encrypted on another machine, or this one has lost its key");
  image.compact();
  return image;
} catch (const SqliteError& error) {
  refuseBackup(path, error.what());
}

DatabaseImage liveImage(bool withoutTokens) {
  DatabaseImage image = readLive();
  if (const Findings problems = checkStructure(image.connection()); !problems.empty())
    throw Failure(ExitCode::kAttention, "the database is not sound, no backup was made: " +
                                            summaryOf(problems) + "; see 'oauthctl check'");
  image.compact();
  if (withoutTokens) image.dropGrants();
  return image;
}

}  // namespace

// The backup belongs to the operator, so it is made before root takes the ids of the folder's
// owner.
void backUp(const Invocation& invocation) {
  const std::string target = fileOperand(invocation);
  NewFile file(target);
  DatabaseFolder::enter(RootIds::kKeep);  // publish() needs the operator's ids
  requireDatabase(Access::kRead);
  DatabaseImage image = liveImage(invocation.has("--without-tokens"));
  file.append(image.bytes());
  requireSound(file);
  file.publish();
  say("wrote " + target + ": " + image.summary());
}

// The backup belongs to the operator, so it is read before root takes the ids of the folder's
// owner.
void restore(const Invocation& invocation) {
  const std::string source = fileOperand(invocation);
  BackupFile backup = readBackupFile(source);
  requireDatabase(Access::kMake);
  requireAnotherFile(backup, source);
  DatabaseImage image = imageOf(std::move(backup), source);
  if (invocation.has("--without-tokens")) image.dropGrants();
  confirm(invocation, "Replace everything in the database by " + image.summary() + "?");
  const std::string kept = replaceLiveDatabase(image);
  say("restored " + image.summary());
  if (!kept.empty()) say("what was there is kept in " + kept);
}

}  // namespace oauthctl
