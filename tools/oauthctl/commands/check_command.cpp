#include "checks/content_checks.h"
#include "checks/file_checks.h"
#include "commands/commands.h"
#include "database/access.h"
#include "database/fixed_paths.h"
#include "database/folder.h"
#include "terminal/exit_code.h"
#include "terminal/table_output.h"
#include "terminal/terminal.h"

namespace oauthctl {
namespace {

void append(Findings& all, const Findings& more) {
  all.insert(all.end(), more.begin(), more.end());
}

// Runs a check. If it reads a damaged page, the other checks still run.
template <class Check>
void runCheck(Findings& findings, Check check) {
  try {
    append(findings, check());
  } catch (const SqliteError& error) {
    if (error.isBusy()) throwUnavailable("the database is busy, try again");
    if (!error.isDamage())
      throwUnavailable("cannot read " + fixed_paths::database() + ": " + error.what());
    const Finding damage = {std::string("cannot be read: ") + error.what(), "restore a backup"};
    if (findings.empty() || findings.back().problem != damage.problem) findings.push_back(damage);
  }
}

void checkContents(Findings& findings) {
  SqliteConnection database(fixed_paths::database(), SQLITE_OPEN_READONLY);
  CipherCount count;
  runCheck(findings, [&] { return checkStructure(database); });
  runCheck(findings, [&] { return checkJournalMode(database); });
  runCheck(findings, [&] { return checkCiphers(database, count); });
  runCheck(findings, [&] { return checkExpiries(database); });
}

void print(const Findings& findings, bool asJson) {
  if (asJson) {
    Json::Value documents(Json::arrayValue);
    for (const Finding& finding : findings) {
      Json::Value document;
      document["problem"] = finding.problem;
      document["advice"] = finding.advice;
      documents.append(document);
    }
    printJson(documents);
    return;
  }
  for (const Finding& finding : findings) say(finding.problem + ". To do: " + finding.advice + ".");
  if (findings.empty()) say("sound: " + fixed_paths::database());
}

Findings findAll() {
  // Root goes no further: others may have put any file there.
  if (const std::string unsafe = DatabaseFolder::enter().unsafeForRoot(); !unsafe.empty())
    return checkFolder(unsafe);
  requireDatabase(Access::kRead);
  Findings findings = checkFiles();
  const Findings journal = checkJournal();
  append(findings, journal);
  append(findings, checkSettings());
  if (journal.empty()) checkContents(findings);
  return findings;
}

}  // namespace

void checkSoundness(const Invocation& invocation) {
  const Findings findings = findAll();
  print(findings, invocation.has("--json"));
  if (findings.empty()) return;
  throw Failure(ExitCode::kAttention, std::to_string(findings.size()) +
                                          (findings.size() == 1 ? " finding" : " findings"));
}

}  // namespace oauthctl
