#include <sstream>

#include "command_table.h"
#include "documents.h"
#include "help_text.h"

namespace oauthctl {
namespace {

// A text as roff prints it: hyphens that can be copied, nothing that looks like a request.
std::string roff(const std::string& text) {
  std::string result;
  for (const char c : text) {
    if (c == '\\')
      result += "\\e";
    else if (c == '-')
      result += "\\-";
    else if (c == '\'')
      result += "\\(aq";
    else
      result += c;
  }
  return result.empty() || result.front() != '.' ? result : "\\&" + result;
}

std::string entry(const std::string& name, const std::string& meaning) {
  return ".TP\n.B " + roff(name) + "\n" + roff(meaning) + "\n";
}

std::string lines(const char* text) {
  std::string result;
  std::istringstream stream(text);
  for (std::string line; std::getline(stream, line);) result += roff(line) + "\n";
  return result;
}

std::string literal(const char* text) { return ".PP\n.RS 4\n.nf\n" + lines(text) + ".fi\n.RE\n"; }

std::string paragraphs(const char* text) {
  std::string result;
  std::istringstream stream(text);
  for (std::string line; std::getline(stream, line);) result += ".PP\n" + roff(line) + "\n";
  return result;
}

std::string section(const Command& command) {
  std::string text = ".SS \"" + roff(usageLine(command)) + "\"\n" + roff(command.summary) + ".\n";
  text += paragraphs(command.details);
  for (const Operand& operand : command.operands) text += entry(operand.name, operand.help);
  for (const Option& option : command.options)
    text += entry(option.name + std::string(option.value == nullptr ? "" : " ") +
                      (option.value == nullptr ? "" : option.value),
                  option.help);
  for (const Example& example : command.examples)
    text += ".PP\nExample, " + roff(example.meaning) + ":\n" + literal(example.line);
  return text;
}

constexpr char kDescription[] =
    "oauthctl is for the people who look after the server: it tells what is in the database and "
    "whether it is nearly full, registers clients, ends logins, cleans up, checks, backs up and "
    "restores. It works on the database file itself, while the server runs or not.\n"
    "Run it as the server's user or as root. Any other user is told what may not be read. Root "
    "takes the ids of the user who owns the folder of the database before it looks into the "
    "folder: new files there belong to that user, and a database closed to that user is not read. "
    "The FILE of backup and restore is opened before that, with root's rights.\n"
    "Reading commands print a table, or with --json a document. Secrets, codes and tokens show "
    "their first four characters only, unless --show-secrets is given, and are never taken from "
    "the command line. Characters that are no printable text are spelt out, such as \\x1b.\n"
    "What deletes or replaces rows asks first. Where nobody can answer, in a script or from "
    "cron, it wants --yes. It is done whole or not at all.\n"
    "A client is named by its number in 'oauthctl client list' or by its identifier of 64 "
    "characters; a code or token by its number in the list of them.";

constexpr char kSession1[] =
    "oauthctl client add --name 'Photo album' \\\n"
    "    --redirect-uri https://album.example/callback --scope 'read write'";
constexpr char kSession2[] =
    "oauthctl status\n"
    "oauthctl check";
constexpr char kSession3[] =
    "oauthctl token list --user alice\n"
    "oauthctl token revoke --user alice";
constexpr char kSession4[] =
    "oauthctl code purge\n"
    "oauthctl token purge --dry-run\n"
    "oauthctl token purge";
constexpr char kSession5[] =
    "oauthctl backup /var/backups/oauth.db\n"
    "oauthctl restore /var/backups/oauth.db";
constexpr char kCron[] =
    "10 * * * *  oauth  oauthctl code purge --yes >/dev/null\n"
    "20 3 * * *  oauth  oauthctl token purge --grace 30d --yes >/dev/null\n"
    "30 3 * * *  oauth  oauthctl backup /var/backups/oauth/$(date +\\%F).db >/dev/null";

std::string firstSession() {
  return ".SH A FIRST SESSION\nRegister a client. It prints the identifier and the secret for the "
         "client\\(aqs developer, once:\n" +
         literal(kSession1) +
         ".PP\nSee how full the tables are, which settings are in force, and whether all is "
         "sound:\n" +
         literal(kSession2) + ".PP\nSee where a user is logged in, and log her out everywhere:\n" +
         literal(kSession3) +
         ".PP\nClean up: expired codes are of no use to anybody; expired tokens are, as long as "
         "clients refresh them, so that only those which expired 30 days ago or more go:\n" +
         literal(kSession4) +
         ".PP\nMake a backup while the server runs, and put it back one day:\n" +
         literal(kSession5) +
         ".PP\nThe same from cron, which mails what goes wrong; oauth stands for the server\\(aqs "
         "user:\n" +
         literal(kCron);
}

std::string exitStatus() {
  return ".SH EXIT STATUS\nWith every status but 0, one line on standard error says why.\n" +
         entry("0", "Fine.") +
         entry("1", "Something needs attention, or was not found, or the operator said no.") +
         entry("2", "Wrong usage. Nothing was changed.") +
         entry("3",
               "The database is busy or cannot be opened. Nothing was changed. Programs "
               "are waited for during 5 to 10 seconds.");
}

std::string files() {
  return ".SH FILES\n" +
         entry("/var/packages/Keyloft/target/etc/oauth.db",
               "The database. Its journal, oauth.db-journal, comes and goes beside it and must "
               "never be deleted or left out of a copy by hand.") +
         entry("/var/packages/Keyloft/target/etc/oauth.cfg",
               "The settings, a JSON object of integers.") +
         entry("/var/packages/Keyloft/target/etc/oauth.db.before-restore-*",
               "What was there before a restore. Delete it when it is no longer wanted: it holds "
               "tokens.");
}

std::string environment() {
  return ".SH ENVIRONMENT\n" +
         entry("NO_COLOR",
               "If it is not empty, no colour is used. Without a terminal none is "
               "used anyway.") +
         entry("TZ", "The time zone of the audit log, as for any other program.");
}

}  // namespace

std::string manualPage() {
  std::string text =
      ".\\\" Made from the program\\(aqs table of commands.\n"
      ".TH OAUTHCTL 1 \"\" \"zevooauth\" \"User Commands\"\n"
      ".SH NAME\noauthctl \\- " +
      roff(kProgramSummary) +
      "\n.SH SYNOPSIS\n.B oauthctl\n.I COMMAND\n.RI [ argument ...]\n.br\n"
      ".B oauthctl\n.RI [ COMMAND ]\n.B \\-\\-help\n.SH DESCRIPTION\n" +
      paragraphs(kDescription) + firstSession() + ".SH COMMANDS\n";
  for (const Command& command : commandTable()) text += section(command);
  return text + exitStatus() + files() + environment();
}

}  // namespace oauthctl
