#include "operations.h"

#include <algorithm>
#include <memory>

#include "floor.h"
#include "oauth_clientInfo.h"
#include "oauth_grantCode.h"
#include "oauth_log.h"
#include "oauth_names.h"
#include "oauth_token.h"
#include "oauth_utils.h"

using namespace ZEVOOAUTHSERVER;

namespace {

using Run = std::function<bool()>;

const std::string kClientId(64, 'c');
constexpr floor_grant kGrant = {"alice",
                                "cccccccccccccccccccccccccccccccccccccccccccccccccccccccccccccccc",
                                "read write",
                                "code",
                                "af0ifjsldkj-5f3c9d1b7e2a4860",
                                "192.0.2.7"};
constexpr floor_client kClient = {"https://album.example/callback", "read write", "Photo album"};

Side side(const char* name, const Run& run) {
  return {name, [run] { return Work{run, nullptr}; }};
}

// Opens the database, runs the body, and closes the database.
template <class Body>
bool onFloor(Body body) {
  sqlite3* const db = floor_open();
  if (db == nullptr) return false;
  const bool done = body(db);
  return floor_close(db) == 1 && done;
}

// The body must deliver count rows.
template <class Body>
bool rowsOnFloor(std::size_t count, Body body) {
  return onFloor([&](sqlite3* db) {
    floor_rows rows{};
    const bool done = body(db, &rows) == 1 && rows.count == count;
    floor_free(&rows);
    return done;
  });
}

std::string atRows(const char* name, int rows) {
  return std::string(name) + " at " + std::to_string(rows) + " rows";
}

// --- A store for the work at hand ---

Operation openAndClose() {
  const auto library = [] {
    const OAUTHDBToken tokens(names::table::kToken);
    return tokens.GetErrCode() == kErrNone;
  };
  const auto floor = [] { return onFloor([](sqlite3*) { return true; }); };
  return {"open and close", {1000}, "", 0, {side("library", library), side("floor", floor)}};
}

Operation verify(int rows) {
  const std::string token = accessToken(rows / 2);
  const auto library = [token] {
    OAUTHDBToken tokens(names::table::kToken);
    Json::Value result;
    return tokens.Verify(token, result) == 1;
  };
  const auto floor = [token] {
    return rowsOnFloor(
        1, [&](sqlite3* db, floor_rows* out) { return floor_verify(db, token.c_str(), out); });
  };
  return {atRows("verify", rows), {rows}, "", 0, {side("library", library), side("floor", floor)}};
}

bool issueTo(OAUTHDBToken& tokens) {
  Json::Value issued;
  return tokens.Add(kGrant.username, kClientId, kGrant.scope, kGrant.flow_type, kGrant.state,
                    kGrant.ip, issued) == 1;
}

Operation issue(int rows) {
  const auto library = [] {
    OAUTHDBToken tokens(names::table::kToken);
    return issueTo(tokens);
  };
  const auto floor = [] {
    return onFloor([](sqlite3* db) { return floor_issue(db, &kGrant, kRowMax) == 1; });
  };
  return {atRows("issue", rows),
          {rows},
          names::table::kToken,
          rows + 1,
          {side("library", library), side("floor", floor)}};
}

Operation findRefreshToken(int rows) {
  const std::string token = refreshToken(rows / 2);
  const auto library = [token] {
    OAUTHDBToken tokens(names::table::kToken);
    Json::Value found;
    return tokens.GetWithRefreshToken(token, &found) == 1 && found.size() == 1;
  };
  const auto floor = [token] {
    return rowsOnFloor(1, [&](sqlite3* db, floor_rows* out) {
      return floor_find_refresh_token(db, token.c_str(), out);
    });
  };
  return {atRows("look up by refresh token", rows),
          {rows},
          "",
          0,
          {side("library", library), side("floor", floor)}};
}

Operation readAll(int rows) {
  const auto library = [rows] {
    OAUTHDBToken tokens(names::table::kToken);
    Json::Value all;
    return tokens.Get(&all) == 1 && all.size() == static_cast<unsigned>(rows);
  };
  const auto floor = [rows] {
    return rowsOnFloor(static_cast<std::size_t>(rows), floor_read_tokens);
  };
  return {
      atRows("read all", rows), {rows}, "", 0, {side("library", library), side("floor", floor)}, 1};
}

// Every second row has expired.
Operation purge(const std::string& name, int rows) {
  const auto library = [] { return OAUTHDBToken(names::table::kToken).Purge() == 1; };
  const auto floor = [] {
    return onFloor([](sqlite3* db) { return floor_purge_tokens(db) == 1; });
  };
  return {name,
          {rows, rows / 2},
          names::table::kToken,
          rows - rows / 2,
          {side("library", library), side("floor", floor)},
          1};
}

Operation registerClient() {
  const auto library = [] {
    OAUTHDBClientInfo clients(names::table::kClientInfo);
    Json::Value made;
    return clients.Add(kClient.redirect_uri, kClient.scope, kClient.display_name, made) == 1;
  };
  const auto floor = [] {
    return onFloor([](sqlite3* db) { return floor_register(db, &kClient, kRowMax, kLogMax) == 1; });
  };
  return {"register a client",
          {},
          names::table::kClientInfo,
          1,
          {side("library", library), side("floor", floor)}};
}

Operation issueCode() {
  const auto library = [] {
    OAUTHDBGrantCode codes(names::table::kGrantCode);
    Json::Value issued, found;
    return codes.Add(kGrant.username, kClientId, kGrant.scope, kGrant.state, kGrant.ip, issued) ==
               1 &&
           codes.Get(issued[names::column::kCode].asString(), &found) == 1 && found.size() == 1;
  };
  const auto floor = [] {
    return rowsOnFloor(1, [](sqlite3* db, floor_rows* out) {
      char code[65];
      return static_cast<int>(floor_issue_code(db, &kGrant, kRowMax, code) == 1 &&
                              floor_find_code(db, code, out) == 1);
    });
  };
  return {"issue a code and look it up",
          {},
          names::table::kGrantCode,
          1,
          {side("library", library), side("floor", floor)}};
}

Operation writeLog(const std::string& name, int lines) {
  Rows rows;
  rows.logLines = lines;
  const auto library = [] {
    return OAUTHDBLog(names::table::kLog).Add("Application registed[Photo album]") == 1;
  };
  const auto floor = [] {
    return onFloor([](sqlite3* db) {
      return floor_log(db, "Application registed[Photo album]", kLogMax) == 1;
    });
  };
  return {name,
          rows,
          names::table::kLog,
          std::min(lines + 1, kLogMax),
          {side("library", library), side("floor", floor)}};
}

// --- Without a store ---

Operation randomString() {
  const auto library = [] { return getRandomStr(64).size() == 64; };
  const auto floor = [] {
    char text[65];
    return floor_random(text) == 1;
  };
  return {"random string of 64", {}, "", 0, {side("library", library), side("floor", floor)}};
}

Operation setting() {
  const auto library = [] { return getTableRowMax(names::setting::kTokenMax) == kRowMax; };
  const auto floor = [] { return floor_settings() == 1; };
  return {"one settings query", {}, "", 0, {side("library", library), side("floor", floor)}};
}

// --- A store held open ---

// The floor's connection, with its prepared statements.
class HeldFloor {
 public:
  HeldFloor() : db_(floor_open()) {
    if (db_ == nullptr || floor_prepare(db_, &statements) != 1)
      throw std::runtime_error("cannot open the floor");
  }
  ~HeldFloor() {
    floor_finalize(&statements);
    floor_close(db_);
  }
  HeldFloor(const HeldFloor&) = delete;
  HeldFloor& operator=(const HeldFloor&) = delete;

  sqlite3* db() const { return db_; }
  floor_statements statements{};

 private:
  sqlite3* const db_;
};

// A side that keeps its own store open. Both body and undo use that store.
template <class Held, class Body>
Side heldSide(const char* name, std::function<std::shared_ptr<Held>()> open, Body body,
              std::function<void(Held&)> undo) {
  return {name, [open, body, undo] {
            const std::shared_ptr<Held> held = open();
            Work work{[held, body] { return body(*held); }, nullptr};
            if (undo) work.undo = [held, undo] { undo(*held); };
            return work;
          }};
}

std::shared_ptr<OAUTHDBToken> openStore() {
  return std::make_shared<OAUTHDBToken>(names::table::kToken);
}
std::shared_ptr<HeldFloor> openFloor() { return std::make_shared<HeldFloor>(); }

Operation verifyHeld(int rows) {
  const std::string token = accessToken(rows / 2);
  const auto library = [token](OAUTHDBToken& tokens) {
    Json::Value result;
    return tokens.Verify(token, result) == 1;
  };
  const auto floor = [token](HeldFloor& held) {
    floor_rows found{};
    const bool done = floor_verify(held.db(), token.c_str(), &found) == 1;
    floor_free(&found);
    return done;
  };
  const auto prepared = [token](HeldFloor& held) {
    floor_rows found{};
    const bool done = floor_verify_prepared(&held.statements, token.c_str(), &found) == 1;
    floor_free(&found);
    return done;
  };
  return {"verify on a store held open",
          {rows},
          "",
          0,
          {heldSide<OAUTHDBToken>("library", openStore, library, nullptr),
           heldSide<HeldFloor>("floor", openFloor, floor, nullptr),
           heldSide<HeldFloor>("prepared", openFloor, prepared, nullptr)}};
}

Operation issueHeld(int rows) {
  // The connection that wrote also deletes, so it need not read the file again.
  const std::string undo = "DELETE FROM oauth_token WHERE id>" + std::to_string(rows) + ";";
  const std::function<void(OAUTHDBToken&)> undoInStore = [undo](OAUTHDBToken& tokens) {
    tokens.DBCmd(undo, nullptr, nullptr);
  };
  const std::function<void(HeldFloor&)> undoOnFloor = [undo](HeldFloor& held) {
    sqlite3_exec(held.db(), undo.c_str(), nullptr, nullptr, nullptr);
  };
  const auto floor = [](HeldFloor& held) { return floor_issue(held.db(), &kGrant, kRowMax) == 1; };
  const auto prepared = [](HeldFloor& held) {
    return floor_issue_prepared(&held.statements, &kGrant, kRowMax) == 1;
  };
  return {"issue on a store held open",
          {rows},
          names::table::kToken,
          rows + 1,
          {heldSide<OAUTHDBToken>("library", openStore, issueTo, undoInStore),
           heldSide<HeldFloor>("floor", openFloor, floor, undoOnFloor),
           heldSide<HeldFloor>("prepared", openFloor, prepared, undoOnFloor)}};
}

}  // namespace

std::vector<Operation> operations() {
  return {openAndClose(),
          verify(1000),
          verify(10000),
          issue(0),
          issue(999),
          issue(9999),
          findRefreshToken(1000),
          findRefreshToken(10000),
          registerClient(),
          issueCode(),
          readAll(1000),
          readAll(10000),
          purge("purge 1000 of 2000 rows", 2000),
          writeLog("write to the audit log below its ceiling", kLogMax / 2),
          writeLog("write to the audit log at its ceiling", kLogMax),
          randomString(),
          setting(),
          verifyHeld(1000),
          issueHeld(999)};
}

std::vector<Operation> sizes() {
  std::vector<Operation> result;
  for (const int rows : {2500, 5000, 7500}) {
    for (const auto& make : {verify, issue, findRefreshToken, readAll})
      result.push_back(make(rows));
    result.push_back(purge(atRows("purge half", rows), rows));
  }
  for (const int lines : {250, 500, 750})
    result.push_back(writeLog(atRows("write to the audit log", lines), lines));
  return result;
}
