// One side of an exchange of database files between architectures.
//
//   database_exchange write  FOLDER    makes a database of every kind of row
//   database_exchange check  FOLDER    reads and verifies what the other side wrote
//   database_exchange change FOLDER    edits, revokes and purges it
//   database_exchange changed FOLDER   checks the rows that are left after that
//
// FOLDER holds the database and the key. Values are encrypted as by the stand-in for the host's
// core library; the clock stands still, so that both sides agree on what has expired.

#include <cstring>
#include <exception>
#include <iostream>
#include <map>
#include <stdexcept>

#include "fake_clock.h"
#include "fake_ids.h"
#include "host_libraries.h"
#include "oauth_clientInfo.h"
#include "oauth_grantCode.h"
#include "oauth_log.h"
#include "oauth_token.h"
#include "redirected_files.h"
#include "zevocore_key.h"
#include "zevocore_siv.h"

using namespace ZEVOOAUTHSERVER;

namespace {

constexpr long long kNow = 1'700'000'000;
constexpr long long kAbove31Bits = 2'147'483'653;  // 2^31 + 5
constexpr long long kAbove32Bits = 4'294'967'303;  // 2^32 + 7
constexpr long long kFarExpiry = kNow + 2'147'483'647;
constexpr char kLongText[] = "O'Brien \xC3\xA9t\xC3\xA9 %_;--";

std::string folder;

std::string filled(char c) { return std::string().assign(64, c); }

void expect(bool ok, const std::string& what) {
  if (!ok) throw std::runtime_error(what);
}

Json::Value only(const Json::Value& rows, const std::string& what) {
  expect(rows.size() == 1, what + ": one row");
  return rows[0U];
}

// Inserts a row with a given id, which no store can do.
void addToken(const std::string& id, char token, long long expiry) {
  OAUTHDBToken tokens("oauth_token");
  Json::Value record;
  record["id"] = id;
  record["username"] = "alice";
  record["client_id"] = filled('c');
  record["scope"] = "read";
  record["refresh_token"] = filled(static_cast<char>(token + 1));
  record["access_token"] = filled(token);
  record["expired_time"] = std::to_string(expiry);
  record["flow_type"] = "code";
  record["state"] = "xyz";
  expect(tokens.DBAdd(record), "add token " + id);
}

void write() {
  Json::Value result;
  OAUTHDBClientInfo clients("oauth_clientInfo");
  expect(clients.Add(filled('c'), filled('s'), "https://app.example/cb", kLongText, "App", "1",
                     result),
         "add client");
  OAUTHDBGrantCode codes("oauth_grantCode");
  expect(codes.Add("alice", filled('c'), "read", filled('1'), std::to_string(kNow + 600), "xyz",
                   "2001:db8::7", result),
         "add code");
  expect(codes.Add("alice", filled('c'), "read", filled('2'), std::to_string(kNow - 1), "xyz", "",
                   result),
         "add expired code");
  addToken("1", 'a', kFarExpiry);
  addToken("2", 'd', kNow - 1);
  addToken(std::to_string(kAbove31Bits), 'g', kNow);
  addToken(std::to_string(kAbove32Bits), 'k', 9'223'372'036'854'775'807LL);
}

void checkClient() {
  OAUTHDBClientInfo clients("oauth_clientInfo");
  Json::Value rows;
  expect(clients.Get(filled('c'), &rows), "get client");
  const Json::Value client = only(rows, "client");
  expect(client["client_id"] == filled('c'), "identifier");
  expect(client["client_secret"] == filled('s'), "secret");
  expect(client["redirect_uri"] == "app.example/cb", "redirect URI");
  expect(client["scope"] == "O''Brien \xC3\xA9t\xC3\xA9 %_;--", "scope");
  expect(clients.GetIndex(filled('c')) == 1, "client's row id");
}

void checkLog() {
  OAUTHDBLog log("oauth_log");
  Json::Value rows;
  expect(log.Get("registed", "", &rows), "get log");
  const Json::Value line = only(rows, "log");
  expect(line["msg"] == "Application registed[App]", "message");
  // The database's own clock: any time since this program was first written.
  expect(std::stoll(line["timestamp"].asString()) > kNow,
         "timestamp " + line["timestamp"].asString());
}

void checkToken(char token, bool valid, int index) {
  OAUTHDBToken tokens("oauth_token");
  Json::Value result;
  expect((tokens.Verify(filled(token), result) != 0) == valid, std::string("verify ") + token);
  expect(valid ? result["username"] == "alice" : result["err_code"] == kErrTokenExpired,
         std::string("answer for ") + token);
  expect(tokens.GetIndex(filled(token)) == index, std::string("row id of ") + token);
  Json::Value rows;
  expect(tokens.GetWithRefreshToken(filled(static_cast<char>(token + 1)), &rows), "refresh token");
  expect(only(rows, "refresh token")["client_id"] == filled('c'), "token's client");
}

void check() {
  checkClient();
  checkLog();
  checkToken('a', true, 1);
  checkToken('d', false, 2);
  checkToken('g', true, -2'147'483'643);  // the low 32 bits of 2^31 + 5
  checkToken('k', true, 7);               // the low 32 bits of 2^32 + 7
  OAUTHDBGrantCode codes("oauth_grantCode");
  Json::Value rows;
  expect(codes.Get(filled('1'), &rows), "get code");
  expect(only(rows, "code")["ip"] == "2001:db8::7", "code's address");
  expect(codes.GetIndex(filled('2')) == 2, "code's row id");
}

void change() {
  OAUTHDBClientInfo clients("oauth_clientInfo");
  expect(clients.Edit(1, "https://new.example/cb", "write", "New"), "edit client");
  expect(clients.Disable(1), "disable client");
  OAUTHDBGrantCode codes("oauth_grantCode");
  expect(codes.Purge(), "purge codes");
  OAUTHDBToken tokens("oauth_token");
  expect(tokens.Purge(), "purge tokens");
  expect(tokens.Edit(kAbove31Bits, "bob", filled('c'), "write", "code", "changed"), "edit token");
  expect(tokens.Revoke(kAbove32Bits), "revoke token");
  OAUTHDBLog log("oauth_log");
  expect(log.Add("changed"), "add to log");
}

void changed() {
  OAUTHDBClientInfo clients("oauth_clientInfo");
  Json::Value rows;
  expect(clients.Get(filled('c'), &rows), "get client");
  expect(only(rows, "client")["redirect_uri"] == "https://new.example/cb", "redirect URI");
  expect(rows[0U]["enable"] == "0", "disabled");
  OAUTHDBGrantCode codes("oauth_grantCode");
  expect(codes.Get(&rows), "get codes");
  expect(only(rows, "codes")["code"] == filled('1'), "the code that is left");
  OAUTHDBToken tokens("oauth_token");
  expect(tokens.Get(&rows), "get tokens");
  expect(rows.size() == 2, "two tokens are left");
  expect(rows[0U]["id"] == "1", "the first");
  expect(rows[1U]["id"] == std::to_string(kAbove31Bits), "the second");
  expect(rows[1U]["username"] == "bob", "its user");
  OAUTHDBLog log("oauth_log");
  expect(log.Get("", "ORDER BY id", &rows), "get log");
  expect(rows.size() == 2, "two lines in the log");
}

int deliver(const std::optional<std::string>& text, char* out, int outSize) {
  if (!text || text->size() >= static_cast<std::size_t>(outSize)) return 0;
  std::memcpy(out, text->c_str(), text->size() + 1);
  return 1;
}

}  // namespace

extern "C" int ZOCLCryptSzEncrypt(const char* plain, char* out, int outSize) {
  const std::optional<zevocore::Key> key = zevocore::loadKey(folder);
  return key ? deliver(zevocore::seal(*key, plain), out, outSize) : 0;
}

extern "C" int ZOCLCryptSzDecrypt(const char* cipher, char* out, int outSize) {
  const std::optional<zevocore::Key> key = zevocore::loadKey(folder);
  return key ? deliver(zevocore::unseal(*key, cipher), out, outSize) : 0;
}

int main(int argc, char** argv) {
  const std::map<std::string, void (*)()> steps = {
      {"write", write}, {"check", check}, {"change", change}, {"changed", changed}};
  if (argc != 3 || steps.count(argv[1]) == 0) {
    std::cerr << "usage: database_exchange write|check|change|changed FOLDER\n";
    return 2;
  }
  try {
    folder = argv[2];
    const RedirectedFiles files(folder);
    FakeClock clock;
    clock.set(kNow);
    const FakeIds root;
    steps.at(argv[1])();
  } catch (const std::exception& error) {
    std::cerr << "database_exchange " << argv[1] << ": wrong: " << error.what() << '\n';
    return 1;
  }
  return 0;
}
