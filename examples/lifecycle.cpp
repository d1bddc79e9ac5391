// The main job of the library as a short story: a client, a code and three tokens live their
// lives on the real database file, and leave it as it was.

#include <sqlite3.h>
#include <unistd.h>

#include <csignal>
#include <cstdlib>
#include <ctime>
#include <functional>
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

// Why the story cannot go on.
struct Trouble : std::runtime_error {
  using std::runtime_error::runtime_error;
};

[[noreturn]] void giveUp(const OAUTHDBBasic& store, const std::string& what) {
  throw Trouble("cannot " + what + " in " + kDatabase + ": " + store.GetErrMsg());
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

// What the story made, undone in reverse order on every way out.
class Traces {
 public:
  ~Traces() {
    if (undos_.empty()) return;
    bool removed = true;
    for (auto undo = undos_.rbegin(); undo != undos_.rend(); ++undo) removed &= (*undo)();
    if (removed)
      std::cout << "\nThe rows that this demo made are removed again.\n";
    else
      std::cerr << "lifecycle: some rows of this demo could not be removed\n";
  }
  // Returns whether nothing is left.
  void undoWith(std::function<bool()> undo) { undos_.push_back(std::move(undo)); }

 private:
  std::vector<std::function<bool()>> undos_;
};

// One row as it lies in the file, encrypted columns and all, past the library.
void showRow(const std::string& table, long long id) {
  sqlite3* db = nullptr;
  sqlite3_open(kDatabase, &db);
  const std::string sql = "SELECT * FROM " + table + " WHERE id=" + std::to_string(id);
  say(table);
  const auto print = [](void*, int columns, char** values, char** names) {
    for (int i = 0; i < columns; ++i)
      say("  " + std::string(names[i]) + " = " + (values[i] == nullptr ? "NULL" : values[i]));
    return 0;
  };
  sqlite3_exec(db, sql.c_str(), print, nullptr, nullptr);
  sqlite3_close(db);
}

// The newest audit line would push out the oldest one of somebody else.
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
    traces.undoWith([identifier = client.identifier] {
      OAUTHDBClientInfo store("oauth_clientInfo");
      Json::Value found;
      if (!store.Get(identifier, &found)) return false;
      return found.empty() || store.Del(idOf(found[0U])) != 0;
    });
    if (!clients.Get(client.identifier, &rows) || rows.empty()) giveUp(clients, "find the client");
    client.id = idOf(rows[0U]);
  }
  traces.undoWith([name] {
    OAUTHDBLog log("oauth_log");
    Json::Value lines;
    bool removed = log.Get(name, "", &lines) != 0;
    for (const Json::Value& line : lines) {
      Json::Value request;
      request["condition"]["id"] = line["id"];
      removed &= log.DBDel(request);
    }
    return removed;
  });
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
  traces.undoWith([code] {
    OAUTHDBGrantCode store("oauth_grantCode");
    Json::Value found;
    if (!store.Get(code, &found)) return false;
    return found.empty() || store.Del(idOf(found[0U])) != 0;
  });
  say("code " + brief(code) + " lives for " +
      std::to_string(getExpiredPeriod("grantcode_expired")) + " seconds");

  title("The album hands the code in, and it is spent");
  OAUTHDBGrantCode codes("oauth_grantCode");
  Json::Value rows;
  if (!codes.Get(code, &rows) || rows.empty()) giveUp(codes, "find the code");
  const long long id = idOf(rows[0U]);
  if (!codes.Del(id)) giveUp(codes, "spend the code");
  say("deleted: yes; a second try: " + std::string(codes.Del(id) ? "YES" : "no, it is gone"));
}

bool forget(const std::string& accessToken) {
  OAUTHDBToken store("oauth_token");
  Json::Value found;
  if (!store.GetWithAccessToken(accessToken, &found)) return false;
  return found.empty() || store.Revoke(idOf(found[0U])) != 0;
}

Json::Value issueTokens(Traces& traces, const Client& client) {
  OAUTHDBToken tokens("oauth_token");
  Json::Value issued;
  if (!tokens.Add("alice", client.identifier, "read", "code", "xyz", kIp, issued))
    giveUp(tokens, "issue tokens");
  traces.undoWith([token = issued["access_token"].asString()] { return forget(token); });
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

// A refresh token is rotated: whoever revokes the old row may issue the new one.
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

// True if another row expires within the next minute or has: sweeping would take it too.
template <class Store>
bool othersExpire(const char* table, const std::string& ownAccessToken) {
  Store store(table);
  Json::Value rows;
  if (!store.Get(&rows)) giveUp(store, "read " + std::string(table));
  const long long soon = static_cast<long long>(std::time(nullptr)) + 60;
  for (const Json::Value& row : rows)
    if (row["access_token"].asString() != ownAccessToken &&
        std::strtoll(row["expired_time"].asString().c_str(), nullptr, 10) < soon)
      return true;
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
  traces.undoWith([access] { return forget(access); });
  verify("at once          ", access);
  std::cout.flush();
  sleep(3);
  verify("three seconds on ", access);

  title("The sweep takes what has expired");
  if (othersExpire<OAUTHDBToken>("oauth_token", access) ||
      othersExpire<OAUTHDBGrantCode>("oauth_grantCode", "")) {
    say("skipped: this file holds expired rows of others, which a sweep would delete too");
    return;
  }
  OAUTHDBToken tokens("oauth_token");
  OAUTHDBGrantCode codes("oauth_grantCode");
  if (!tokens.Purge() || !codes.Purge()) giveUp(tokens, "purge");
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

void tell() {
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
}

}  // namespace

int main() {
  // The rows are removed also when somebody stops the demo or closes its output.
  for (const int signal : {SIGINT, SIGTERM, SIGHUP})
    std::signal(signal, [](int) { interrupted = 1; });
  std::signal(SIGPIPE, SIG_IGN);
  try {
    tell();
  } catch (const std::exception& error) {
    std::cout.flush();
    std::cerr << "lifecycle: " << error.what() << '\n';
    return 1;
  }
  return 0;
}
