#include "command_line/command_table.h"

#include "commands/commands.h"
#include "database/grants.h"
#include "database/image.h"

namespace oauthctl {

namespace limit = names::limit;

namespace {

// "64", or "1 to 64"
std::string rangeText(const names::Limit& range) {
  const std::string largest = std::to_string(range.max);
  return range.min == range.max ? largest : std::to_string(range.min) + " to " + largest;
}

const Operand kClient = {"CLIENT",
                         "the client's number in 'oauthctl client list', or its identifier of " +
                             rangeText(limit::kClientId) + " characters"};

const Option kJson = {"--json", nullptr, "a JSON document instead of a table"};
const Option kYes = {"--yes", nullptr, "do not ask; needed where nobody can answer"};
const Option kSecrets = {"--show-secrets", nullptr, "secrets, codes and tokens in full"};
const Option kDryRun = {"--dry-run", nullptr, "tell what would be deleted, delete nothing"};
const Option kWithoutTokens = {"--without-tokens", nullptr, "leave codes and tokens out"};

Option byId(Need need) { return {"--id", "N", "the one with this number", need}; }
Option byUser(Need need) { return {"--user", "NAME", "those of this user", need}; }
Option byClient(Need need) {
  return {"--client", "CLIENT", "those of this client, by its number or identifier", need};
}
Option nameOption(Need need) {
  return {"--name", "TEXT", "name shown to people, " + rangeText(limit::kDisplayName) + " bytes",
          need};
}
Option redirectOption(Need need) {
  return {"--redirect-uri", "URI", "where codes are sent; kept without https:// or http://", need};
}
Option scopeOption(Need need) {
  return {"--scope", "TEXT", "what it may ask for, separated by blanks", need};
}
Option graceOption(const std::string& duration) {
  return {"--grace", "DURATION",
          "spare what expired within 90s, 45m, 12h, 30d, 2w (default " + duration + ")"};
}

const std::vector<Command> kOverview = {
    {"status",
     "Show how full the tables are, the settings in force and the file",
     {},
     {kJson},
     "Ends with 1 when clients, codes or tokens fill " + std::to_string(kWarnFrom) +
         " % of their ceiling or more: at 100 % "
         "nothing more is issued. Expired rows count until they are purged. The audit log trims "
         "itself at its ceiling and is never a reason to warn.\n"
         "WHERE FROM tells for each setting whether it comes from the settings file, is a default, "
         "was clamped to its range, or has a wrong type in the file and is therefore ignored.",
     {{"oauthctl status", "look at everything"},
      {"oauthctl status --json | jq '.tables[] | {table, used_percent}'", "feed a monitor"}},
     showStatus},
    {"check",
     "Check that the database is sound and well kept",
     {},
     {kJson},
     "Looks at the pages of the file, the five stored table definitions, the schema versions, "
     "whether every encrypted value decrypts and every expiry is a number, owner and mode of "
     "file and folder, a journal left behind, the settings file and the diagnostics switch. One "
     "line for each finding, with what to do about it. Changes nothing; ends with 1 if there is "
     "a finding.",
     {{"oauthctl check && echo sound", "before and after an upgrade"}},
     checkSoundness},
    {"backup",
     "Copy the database to a new file while the server runs",
     {{"FILE", "the file to make; one that exists is never replaced", true}},
     {kWithoutTokens},
     "The copy is one moment of the database, whatever the server does meanwhile. It has mode "
     "0600, is checked after it was written, and appears under its name only then. With "
     "--without-tokens neither codes nor tokens ever reach the new file.\n"
     "Client identifiers and secrets in the copy are encrypted for this machine: elsewhere, or "
     "without the machine's key, they cannot be read.",
     {{"oauthctl backup /var/backups/oauth-$(date +%F).db", "a backup for each day"},
      {"oauthctl backup clients.db --without-tokens", "one that helps no thief to a login"}},
     backUp},
    {"restore",
     "Replace everything in the database by a backup",
     {{"FILE", "a backup", true}},
     {kWithoutTokens, kYes},
     "Checks the file first and refuses one that is damaged, foreign, or encrypted for another "
     "machine. What was there is kept beside the database, in a file whose name is told. The "
     "server may run: it sees either the old contents or the new ones. FILE must be a regular file "
     "of at most " +
         std::to_string(kLargestDatabase / 1024 / 1024) +
         " MiB, without a journal beside it, and not a link.\n"
         "Codes and refresh tokens spent since the backup become valid again. Use "
         "--without-tokens, "
         "which makes every user log in anew, unless you must keep the logins.",
     {{"oauthctl restore /var/backups/oauth-2026-11-21.db", "ask, then put it back"},
      {"oauthctl restore --without-tokens --yes clients.db", "in a script, clients only"}},
     restore},
};

const std::vector<Command> kClientCommands = {
    {"client list",
     "List the registered clients",
     {},
     {kJson, kSecrets},
     "",
     {{"oauthctl client list", "numbers, names and redirect URIs"}},
     listClients},
    {"client show",
     "Show one client, and how many codes and tokens it holds",
     {kClient},
     {kJson, kSecrets},
     "",
     {{"oauthctl client show 3", "client number 3"}},
     showClient},
    {"client add",
     "Register a client and print its identifier and secret",
     {},
     {nameOption(Need::kRequired),
      redirectOption(Need::kRequired),
      scopeOption(Need::kRequired),
      {"--disabled", nullptr, "register it disabled"},
      {"--secret-from-stdin", nullptr,
       "a secret of " + rangeText(limit::kClientSecret) +
           " bytes from standard input, not a new one"},
      kJson},
     "Hand identifier and secret to the client's developer now: other commands mask the secret. "
     "Makes the database if there is none yet.",
     {{"oauthctl client add --name 'Photo album' --redirect-uri https://album.example/callback "
       "--scope 'read write'",
       "a new client"}},
     addClient},
    {"client edit",
     "Change a client's name, redirect URI or scope",
     {kClient},
     {nameOption(Need::kOptional), redirectOption(Need::kOptional), scopeOption(Need::kOptional)},
     "What is not given stays as it is. Codes and tokens issued before keep their old scope.",
     {{"oauthctl client edit 3 --scope read", "new logins may only read"}},
     editClient},
    {"client enable",
     "Enable a client",
     {kClient},
     {},
     "",
     {{"oauthctl client enable 3", "let client 3 in again"}},
     enableClient},
    {"client disable",
     "Disable a client",
     {kClient},
     {},
     "The server then refuses the client. Codes and tokens that it holds stay valid until they "
     "are revoked: 'oauthctl token revoke --client CLIENT' ends its logins.",
     {{"oauthctl client disable 3", "keep client 3 out for now"}},
     disableClient},
    {"client delete",
     "Delete a client",
     {kClient},
     {{"--with-tokens", nullptr, "delete its codes and tokens too"}, kYes},
     "Without --with-tokens the client's codes and tokens stay valid: whoever holds them can go "
     "on using them.",
     {{"oauthctl client delete 3 --with-tokens", "the client and all its logins"}},
     deleteClient},
};

const std::vector<Command> kCodeCommands = {
    {"code list",
     "List authorization codes",
     {},
     {byUser(Need::kOptional), byClient(Need::kOptional), byId(Need::kOptional), kJson, kSecrets},
     "Codes that meet all conditions given. Ends with 1 if conditions were given and none does.",
     {{"oauthctl code list --client 3", "what client 3 has not traded in yet"}},
     listCodes},
    {"code revoke",
     "Delete authorization codes, so that none of them can be spent",
     {},
     {byUser(Need::kOneOf), byClient(Need::kOneOf), byId(Need::kOneOf), kYes},
     "",
     {{"oauthctl code revoke --user alice", "every code of alice"}},
     revokeCodes},
    {"code purge",
     "Delete expired authorization codes",
     {},
     {graceOption(kCodeGrace), kDryRun, kYes},
     "Nothing that could still be used is lost.",
     {{"oauthctl code purge --yes", "every hour, from cron"}},
     purgeCodes},
};

const std::vector<Command> kTokenCommands = {
    {"token list",
     "List tokens",
     {},
     {byUser(Need::kOptional), byClient(Need::kOptional), byId(Need::kOptional), kJson, kSecrets},
     "Each row is one login: an access token and its refresh token. EXPIRES is about the access "
     "token; the refresh token lives until the row is deleted. Rows that meet all conditions "
     "given; ends with 1 if conditions were given and none does. The tokens themselves appear "
     "with --show-secrets, or masked with --json.",
     {{"oauthctl token list --user alice", "where alice is logged in"}},
     listTokens},
    {"token show",
     "Show one token",
     {{"N", "the token's number in 'oauthctl token list'"}},
     {kJson, kSecrets},
     "",
     {{"oauthctl token show 17", "all about token 17"}},
     showToken},
    {"token verify",
     "Tell whose an access token is, read from standard input",
     {},
     {kJson},
     "Ends with 0 if the token is valid, with 1 if it has expired or is unknown. Says too when "
     "its client is disabled or deleted, which the token itself survives.",
     {{"oauthctl token verify < token.txt", "a token from a file"},
      {"oauthctl token verify", "type or paste it, unseen"}},
     verifyToken},
    {"token revoke",
     "Delete tokens: access and refresh tokens end at once",
     {},
     {byUser(Need::kOneOf), byClient(Need::kOneOf), byId(Need::kOneOf), kYes},
     "",
     {{"oauthctl token revoke --user alice", "log alice out everywhere"},
      {"oauthctl token revoke --client 3 --yes", "all logins of client 3, without asking"}},
     revokeTokens},
    {"token purge",
     "Delete tokens that expired long ago",
     {},
     {graceOption(kTokenGrace), kDryRun, kYes},
     "An expired access token is still a login if the client refreshes it: the refresh token "
     "goes with the row. Hence the 30 days, for which a login may rest unused. Where refresh "
     "tokens are not in use, --grace 0 deletes everything that has expired.",
     {{"oauthctl token purge --dry-run", "see what would go"},
      {"oauthctl token purge --grace 90d --yes", "every day, from cron"}},
     purgeTokens},
};

const std::vector<Command> kLogCommands = {
    {"log",
     "Show the audit log, newest line last, in local time",
     {},
     {{"--match", "TEXT", "lines that contain this text, whatever the case of its letters"},
      {"--last", "N", "the newest N of them"},
      kJson},
     "Ends with 1 if --match finds nothing.",
     {{"oauthctl log --last 20", "what happened lately"},
      {"oauthctl log --match album", "about the album"}},
     showLog},
    {"log clear",
     "Delete every line of the audit log",
     {},
     {kYes},
     "",
     {{"oauthctl log > audit.txt && oauthctl log clear", "keep a copy first"}},
     clearLog},
};

}  // namespace

const char kProgramSummary[] = "look after the database of an OAuth 2.0 authorization server";

const std::vector<Command>& commandTable() {
  static const std::vector<Command> table = [] {
    std::vector<Command> all;
    for (const auto& part :
         {kOverview, kClientCommands, kCodeCommands, kTokenCommands, kLogCommands})
      all.insert(all.end(), part.begin(), part.end());
    return all;
  }();
  return table;
}

const std::vector<Group>& commandGroups() {
  static const std::vector<Group> groups = {{"client", "Registered clients"},
                                            {"code", "Authorization codes"},
                                            {"token", "Access and refresh tokens"}};
  return groups;
}

}  // namespace oauthctl
