// Shows the main work of the library: creates, uses and ends a client, a code and three tokens in
// the real database file, and leaves the file as it was.

#include <sqlite3.h>
#include <unistd.h>

#include <csignal>
#include <ctime>
#include <iostream>
#include <stdexcept>
#include <vector>

#include "oauth_clientInfo.h"
#include "oauth_grantCode.h"
#include "oauth_log.h"
#include "oauth_token.h"
#include "oauth_utils.h"

using namespace ZEVOOAUTHSERVER;

namespace {

constexpr char kDatabase[] = "/var/packages/Keyloft/target/etc/oauth.db";
constexpr char kIp[] = "192.0.2.7";

volatile std::sig_atomic_t interrupted = 0;

// Why the demo must stop.
struct Trouble : std::runtime_error {
  using std::runtime_error::runtime_error;
};

[[noreturn]] void giveUp(const OAUTHDBBasic& store, const std::string& what) {
  const std::string reason = store.GetErrMsg();
  throw Trouble("cannot " + what + " in " + kDatabase + ": " +
                (reason.empty() ? "not found" : reason));
}

void title(const std::string& text) {
  if (interrupted != 0) throw Trouble("interrupted");
  static int step = 0;
  std::cout << '\n' << ++step << ". " << text << '\n';
}

void say(const std::string& text) { std::cout << "   " << text << '\n'; }

std::string brief(const Json::Value& secret) { return secret.asString().substr(0, 16) + "..."; }

long long idOf(const Json::Value& row) { return std::stoll(row["id"].asString()); }

std::string secondsFromNow(long seconds) {
  return std::to_string(static_cast<long long>(std::time(nullptr)) + seconds);
}

// Deletes by value, never by row id: the id may have been given to another program's row.
// True if no such row is left.
bool removeRow(const std::string& table, const std::string& column, const std::string& value) {
  OAUTHDBBasic store;
  store.SetTabName(table);
  Json::Value request;
  request["condition"][column] = value;
  return store.DBDel(request) || store.GetErrCode() == kErrNone;
}

// The rows that the demo made. The destructor removes them.
class Traces {
 public:
  ~Traces() { remove(); }

  void note(const std::string& table, const std::string& column, const std::string& value) {
    rows_.push_back({table, column, value});
  }

  // True if nothing is left.
  bool remove() {
    if (rows_.empty()) return true;
    bool removed = true;
    for (const Row& row : rows_) removed &= removeRow(row.table, row.column, row.value);
    rows_.clear();
    if (removed)
      std::cout << "\nThe rows that this demo made are removed again.\n";
    else
      std::cerr << "lifecycle: some rows of this demo could not be removed\n";
    return removed;
  }

 private:
  struct Row {
    std::string table, column, value;
  };
  std::vector<Row> rows_;
};

// Prints one row as it is stored, with its encrypted columns. Reads the file without the library.
void showRow(const std::string& table, long long id) {
  sqlite3* db = nullptr;
  sqlite3_open(kDatabase, &db);
  const std::string sql = "SELECT * FROM " + table + " WHERE id=" + std::to_string(id);
  say(table);
  const auto print = [](void*, int columns, char** values, char** names) noexcept {
    for (int i = 0; i < columns; ++i)
      say("  " + std::string(names[i]) + " = " + (values[i] == nullptr ? "NULL" : values[i]));
    return 0;
  };
  sqlite3_exec(db, sql.c_str(), print, nullptr, nullptr);
  sqlite3_close(db);
}

// In a full log, the demo's line would push out the oldest line of another program.
void checkRoomInLog() {
  OAUTHDBLog log("oauth_log");
  const int max = getTableRowMax("log_max");
  if (!log.DBCheckRowMax(static_cast<unsigned long>(max)))
    throw Trouble(log.GetErrCode() == kErrNone
                      ? "the audit log is full (log_max " + std::to_string(max) +
                            "): one more line would push out an older one"
                      : std::string("cannot use ") + kDatabase + ": " + log.GetErrMsg() +
                            " (run as a user who may write there)");
}

struct Client {
  std::string identifier, secret;
  long long id = 0, logId = 0;
};

Client registerClient(Traces& traces) {
  title("A client application registers");
  const std::string name = "Photo album " + getRandomStr(1).substr(0, 8);
  Client client;
  {
    OAUTHDBClientInfo clients("oauth_clientInfo");
    Json::Value made, rows;
    const bool added = clients.Add("https://album.example/callback", "read write", name, made);
    if (!added) giveUp(clients, "register a client");
    client.identifier = made["client_id"].asString();
    client.secret = made["client_secret"].asString();
    traces.note("oauth_clientInfo", "client_id", client.identifier);
    traces.note("oauth_log", "msg", "Application registed[" + name + "]");
    if (!clients.Get(client.identifier, &rows) || rows.empty()) giveUp(clients, "find the client");
    client.id = idOf(rows[0U]);
  }
  OAUTHDBLog log("oauth_log");
  Json::Value lines;
  if (!log.Get(name, "", &lines) || lines.empty()) giveUp(log, "find the audit line");
  client.logId = idOf(lines[0U]);

  say("\"" + name + "\" gets an identifier and a secret, told to it once:");
  say("  client_id     " + client.identifier);
  say("  client_secret " + client.secret);
  return client;
}

void showEncryption(const Client& client) {
  title("Neither lies in the file: both are stored encrypted");
  showRow("oauth_clientInfo", client.id);
}

// Issues a code, finds it again and spends it: only the first Del() succeeds.
void tradeCode(Traces& traces, const Client& client) {
  title("Alice allows the album to read her pictures: it gets a code");
  Json::Value issued;
  {
    OAUTHDBGrantCode codes("oauth_grantCode");
    if (!codes.Add("alice", client.identifier, "read", "xyz", kIp, issued))
      giveUp(codes, "issue a code");
  }
  const std::string code = issued["code"].asString();
  traces.note("oauth_grantCode", "code", code);
  say("code " + brief(code) + " lives for " +
      std::to_string(getExpiredPeriod("grantcode_expired")) + " seconds");

  title("The album hands the code in, and it is spent");
  OAUTHDBGrantCode codes("oauth_grantCode");
  Json::Value rows;
  if (!codes.Get(code, &rows) || rows.empty()) giveUp(codes, "find the code");
  if (!codes.Del(idOf(rows[0U]))) giveUp(codes, "spend the code");
  if (!codes.Get(code, &rows)) giveUp(codes, "look the code up again");
  say(std::string("deleted: yes; a second try finds ") +
      (rows.empty() ? "nothing" : "IT STILL THERE"));
}

Json::Value issueTokens(Traces& traces, const Client& client) {
  OAUTHDBToken tokens("oauth_token");
  Json::Value issued;
  if (!tokens.Add("alice", client.identifier, "read", "code", "xyz", kIp, issued))
    giveUp(tokens, "issue tokens");
  traces.note("oauth_token", "access_token", issued["access_token"].asString());
  say("access token  " + brief(issued["access_token"]));
  say("refresh token " + brief(issued["refresh_token"]));
  return issued;
}

void verify(const std::string& who, const Json::Value& accessToken) {
  OAUTHDBToken tokens("oauth_token");
  Json::Value result;
  if (tokens.Verify(accessToken.asString(), result))
    say(who + ": yes, this is " + result["username"].asString() + " with scope \"" +
        result["scope"].asString() + "\"");
  else
    say(who + ": no, " + result["err_msg"].asString() + " [" + result["err_code"].asString() + "]");
}

// Rotates the refresh token: the process that revokes the old row may issue the new one.
Json::Value refresh(Traces& traces, const Client& client, const Json::Value& old) {
  title("The album trades its refresh token for new ones");
  {
    OAUTHDBToken tokens("oauth_token");
    Json::Value rows;
    if (!tokens.GetWithRefreshToken(old["refresh_token"].asString(), &rows) || rows.empty() ||
        !tokens.Revoke(idOf(rows[0U])))
      giveUp(tokens, "rotate the refresh token");
  }
  Json::Value issued = issueTokens(traces, client);
  verify("the old access token", old["access_token"]);
  verify("the new access token", issued["access_token"]);
  return issued;
}

// True if a purge could delete another row too: one that has expired, will expire within the next
// minute, or has an expiry that is not a plain number.
bool othersMayExpire(OAUTHDBToken& tokens, const std::string& ownAccessToken) {
  Json::Value rows;
  if (!tokens.Get(&rows)) giveUp(tokens, "read the tokens");
  const long long soon = static_cast<long long>(std::time(nullptr)) + 60;
  for (const Json::Value& row : rows) {
    const std::string expiry = row["expired_time"].asString();
    const bool plain = !expiry.empty() && expiry.size() <= 18 &&
                       expiry.find_first_not_of("0123456789") == std::string::npos;
    if (row["access_token"].asString() != ownAccessToken && (!plain || std::stoll(expiry) < soon))
      return true;
  }
  return false;
}

void expireToken(Traces& traces, const Client& client) {
  title("A token with a single second to live");
  const std::string access = getRandomStr(64), refreshToken = getRandomStr(64);
  {
    OAUTHDBToken tokens("oauth_token");
    Json::Value issued;
    if (!tokens.Add("alice", client.identifier, "read", refreshToken, access, secondsFromNow(1),
                    "code", "xyz", kIp, issued))
      giveUp(tokens, "issue a token");
  }
  traces.note("oauth_token", "access_token", access);
  verify("at once          ", access);
  std::cout.flush();
  sleep(3);
  verify("three seconds on ", access);

  title("The sweep takes what has expired");
  OAUTHDBToken tokens("oauth_token");
  if (othersMayExpire(tokens, access)) {
    say("skipped: this file holds expired rows of others, which a sweep would delete too");
    return;
  }
  if (!tokens.Purge()) giveUp(tokens, "purge");
  Json::Value rows;
  if (!tokens.GetWithAccessToken(access, &rows)) giveUp(tokens, "look the token up");
  say(std::string("the expired token is ") + (rows.empty() ? "gone" : "STILL THERE"));
}

void showLog(const Client& client) {
  title("What the audit log remembers");
  OAUTHDBLog log("oauth_log");
  Json::Value lines;
  if (!log.Get("", "ORDER BY id DESC LIMIT 5", &lines)) giveUp(log, "read the audit log");
  for (const Json::Value& line : lines) {
    const auto seconds = static_cast<std::time_t>(std::stoll(line["timestamp"].asString()));
    char when[32] = {};
    std::tm local{};
    std::strftime(when, sizeof when, "%Y-%m-%d %H:%M:%S", localtime_r(&seconds, &local));
    say(std::string(when) + "  " + line["msg"].asString() +
        (idOf(line) == client.logId ? "" : "  (not from this demo)"));
  }
}

// True if the demo ran to its end and none of its rows is left in the file.
bool tell() {
  checkRoomInLog();
  Traces traces;
  const Client client = registerClient(traces);
  showEncryption(client);
  tradeCode(traces, client);
  title("In its place it gets an access token and a refresh token");
  const Json::Value first = issueTokens(traces, client);
  verify("a resource server asks", first["access_token"]);
  const Json::Value second = refresh(traces, client, first);
  expireToken(traces, client);
  showLog(client);

  title("The rows as they lie in the file");
  Json::Value rows;
  {
    OAUTHDBToken tokens("oauth_token");
    if (!tokens.GetWithAccessToken(second["access_token"].asString(), &rows) || rows.empty())
      giveUp(tokens, "find the token");
  }
  showRow("oauth_clientInfo", client.id);
  showRow("oauth_token", idOf(rows[0U]));
  showRow("oauth_log", client.logId);
  return traces.remove();
}

}  // namespace

int main() {
  // The rows are also removed when somebody stops the demo or closes its output.
  for (const int signal : {SIGINT, SIGTERM, SIGHUP})
    std::signal(signal, [](int) { interrupted = 1; });
  std::signal(SIGPIPE, SIG_IGN);
  try {
    return tell() ? 0 : 1;
  } catch (const std::exception& error) {
    std::cout.flush();
    std::cerr << "lifecycle: " << error.what() << '\n';
    return 1;
  }
}
