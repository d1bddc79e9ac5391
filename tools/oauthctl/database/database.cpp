#include "database/database.h"

#include <sqlite3.h>

#include "database/fixed_paths.h"
#include "decimal_text.h"
#include "terminal/exit_code.h"

namespace oauthctl {

using ZEVOOAUTHSERVER::decimalNumber;
using ZEVOOAUTHSERVER::OAUTHDBBasic;

namespace column = names::column;
namespace request = names::request;

void requireReady(const OAUTHDBBasic& store) {
  if (store.GetErrCode() == ZEVOOAUTHSERVER::kErrNone) return;
  throwUnavailable(fixed_paths::database() + " is busy or cannot be used (" + store.GetErrMsg() +
                   "): try again, then 'oauthctl check'");
}

void throwReason(const OAUTHDBBasic& store, const std::string& operation) {
  const int code = store.GetErrCode();
  if (code == SQLITE_BUSY || code == SQLITE_LOCKED)
    throwUnavailable("the database is busy, nothing changed: cannot " + operation + ", try again");
  throwUnavailable("cannot " + operation + ": " + store.GetErrMsg() + " [" + std::to_string(code) +
                   "], see the system log and 'oauthctl check'");
}

bool attempt(OAUTHDBBasic& store, const std::string& operation, const std::function<bool()>& body) {
  store.SetErrCode(SQLITE_OK);  // a missing row sets no error, a success clears none
  if (body()) return true;
  if (store.GetErrCode() == SQLITE_OK) return false;
  throwReason(store, operation);
}

void throwChangedMeanwhile(const std::string& text) {
  throw Failure(ExitCode::kAttention,
                text + " was changed, replaced or deleted meanwhile, nothing changed");
}

Database::Database(Access access) {
  requireDatabase(access);
  store_ = std::make_unique<OAUTHDBBasic>();
  requireReady(*store_);
}

Json::Value Database::rows(const char* table, const Json::Value& condition) {
  store_->SetTabName(table);
  Json::Value document, result;
  document[request::kCondition] = condition;
  attempt(*store_, std::string("read ") + table, [&] { return store_->DBGet(document, &result); });
  return result;
}

int Database::rowCount(const char* table) {
  store_->SetTabName(table);
  Json::Value count;
  attempt(*store_, std::string("count ") + table, [&] { return store_->DBGetRowCount(&count); });
  return static_cast<int>(decimalNumber(count[0U].asString()).value_or(0));
}

bool Database::remove(const char* table, long long id) {
  store_->SetTabName(table);
  Json::Value document;
  document[request::kCondition][column::kId] = static_cast<Json::Int64>(id);
  return attempt(*store_, std::string("delete from ") + table,
                 [&] { return store_->DBDel(document); });
}

bool Database::edit(const char* table, long long id, const Json::Value& modified) {
  store_->SetTabName(table);
  Json::Value document;
  document[request::kCondition][column::kId] = static_cast<Json::Int64>(id);
  document[request::kModified] = modified;
  return attempt(*store_, std::string("change ") + table, [&] { return store_->DBEdit(document); });
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

std::string originalText(const std::string& stored) {
  std::string text;
  for (std::size_t i = 0; i < stored.size(); ++i) {
    text += stored[i];
    if (stored[i] == '\'' && i + 1 < stored.size() && stored[i + 1] == '\'') ++i;
  }
  return text;
}

long long idOf(const Json::Value& row) {
  return decimalNumber(row[column::kId].asString()).value_or(0);
}

Json::Value idValue(const Json::Value& row) {
  const auto result = decimalNumber(row[column::kId].asString());
  return result ? Json::Value(static_cast<Json::Int64>(*result)) : row[column::kId];
}

long long idForChange(const Json::Value& row) {
  const std::string id = row[column::kId].asString();
  const auto result = decimalNumber(id);
  if (!result)
    throw Failure(ExitCode::kAttention,
                  "nothing changed, the row's id '" + id + "' is no number: see 'oauthctl check'");
  return *result;
}

}  // namespace oauthctl
