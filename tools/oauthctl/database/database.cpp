#include "database.h"

#include <sqlite3.h>

#include "exit_code.h"
#include "fixed_paths.h"
#include "human_time.h"

namespace oauthctl {

using ZEVOOAUTHSERVER::OAUTHDBBasic;

void requireReady(const OAUTHDBBasic& store) {
  if (store.GetErrCode() == ZEVOOAUTHSERVER::kErrNone) return;
  throw Failure(ExitCode::kUnavailable, fixed_paths::database() + " is busy or cannot be used (" +
                                            store.GetErrMsg() +
                                            "): try again, then 'oauthctl check'");
}

void throwReason(const OAUTHDBBasic& store, const std::string& operation) {
  const int code = store.GetErrCode();
  if (code == SQLITE_BUSY || code == SQLITE_LOCKED)
    throw Failure(ExitCode::kUnavailable,
                  "the database is busy, nothing changed: cannot " + operation + ", try again");
  throw Failure(ExitCode::kUnavailable, "cannot " + operation + ": " + store.GetErrMsg() + " [" +
                                            std::to_string(code) +
                                            "], see the system log and 'oauthctl check'");
}

bool attempt(OAUTHDBBasic& store, const std::string& operation, const std::function<bool()>& body) {
  store.SetErrCode(0);  // a missing row records no error, and a success clears none
  if (body()) return true;
  if (store.GetErrCode() == 0) return false;
  throwReason(store, operation);
}

Database::Database(Access access) {
  requireDatabase(access);
  store_ = std::make_unique<OAUTHDBBasic>();
  requireReady(*store_);
}

Json::Value Database::rows(const char* table, const Json::Value& condition) {
  store_->SetTabName(table);
  Json::Value request, result;
  request["condition"] = condition;
  attempt(*store_, std::string("read ") + table, [&] { return store_->DBGet(request, &result); });
  return result;
}

int Database::rowCount(const char* table) {
  store_->SetTabName(table);
  Json::Value counted;
  attempt(*store_, std::string("count ") + table, [&] { return store_->DBGetRowCount(&counted); });
  return static_cast<int>(number(counted[0U].asString()).value_or(0));
}

bool Database::remove(const char* table, long long id) {
  store_->SetTabName(table);
  Json::Value request;
  request["condition"]["id"] = static_cast<Json::Int64>(id);
  return attempt(*store_, std::string("delete from ") + table,
                 [&] { return store_->DBDel(request); });
}

bool Database::edit(const char* table, long long id, const Json::Value& modified) {
  store_->SetTabName(table);
  Json::Value request;
  request["condition"]["id"] = static_cast<Json::Int64>(id);
  request["modified"] = modified;
  return attempt(*store_, std::string("change ") + table, [&] { return store_->DBEdit(request); });
}

void Database::run(const std::string& sql) {
  attempt(*store_, sql == "COMMIT;" ? "write" : "get the write lock",
          [&] { return store_->DBCmd(sql, nullptr, nullptr); });
}

void Database::inTransaction(const std::function<void()>& body) {
  run("BEGIN IMMEDIATE;");
  try {
    body();
    run("COMMIT;");
  } catch (...) {
    store_->DBCmd("ROLLBACK;", nullptr, nullptr);
    throw;
  }
}

std::string asGiven(const std::string& stored) {
  std::string text;
  for (std::size_t i = 0; i < stored.size(); ++i) {
    text += stored[i];
    if (stored[i] == '\'' && i + 1 < stored.size() && stored[i + 1] == '\'') ++i;
  }
  return text;
}

long long idOf(const Json::Value& row) { return number(row["id"].asString()).value_or(0); }

Json::Value idValue(const Json::Value& row) {
  const auto result = number(row["id"].asString());
  return result ? Json::Value(static_cast<Json::Int64>(*result)) : row["id"];
}

long long idForChange(const Json::Value& row) {
  const std::string id = row["id"].asString();
  const auto result = number(id);
  if (!result)
    throw Failure(ExitCode::kAttention,
                  "nothing changed, the row's id '" + id + "' is no number: see 'oauthctl check'");
  return *result;
}

}  // namespace oauthctl
