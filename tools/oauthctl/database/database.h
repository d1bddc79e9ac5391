// The database through the library: one connection for the command at hand, whose failures are
// thrown.

#pragma once

#include <json/value.h>

#include <functional>
#include <memory>
#include <string>

#include "database_access.h"
#include "oauth_db_basic.h"

namespace oauthctl {

inline constexpr char kClientTable[] = "oauth_clientInfo";
inline constexpr char kCodeTable[] = "oauth_grantCode";
inline constexpr char kTokenTable[] = "oauth_token";
inline constexpr char kLogTable[] = "oauth_log";
inline constexpr char kMetaTable[] = "oauth_meta";

// Throws unless the store is ready for use.
void requireReady(const ZEVOOAUTHSERVER::OAUTHDBBasic& store);
// Why the store's last operation failed.
[[noreturn]] void throwReason(const ZEVOOAUTHSERVER::OAUTHDBBasic& store,
                              const std::string& operation);
// Runs an operation of a store. True if it succeeded, false if there was no such row; throws if it
// failed for any other reason.
bool attempt(ZEVOOAUTHSERVER::OAUTHDBBasic& store, const std::string& operation,
             const std::function<bool()>& body);

class Database {
 public:
  explicit Database(Access access);

  // Every row, or those whose columns have these values; a text goes through the library's quoting
  // first, as it did when it was stored.
  Json::Value rows(const char* table, const Json::Value& condition = Json::nullValue);
  int rowCount(const char* table);
  // False if there is no such row.
  bool remove(const char* table, long long id);
  bool edit(const char* table, long long id, const Json::Value& modified);

  // All or nothing, and under the write lock from the start: no row comes or goes between the look
  // and the change.
  void inTransaction(const std::function<void()>& body);

 private:
  void run(const std::string& sql);

  std::unique_ptr<ZEVOOAUTHSERVER::OAUTHDBBasic> store_;
};

// A stored text as it was given: the library keeps every single quote doubled.
std::string asGiven(const std::string& stored);

// A row's id, which comes as decimal text; 0 if it is no number.
long long idOf(const Json::Value& row);
// The id for a document: a number, or the text that somebody put there.
Json::Value idValue(const Json::Value& row);
// The id of a row that is to be changed or deleted. Throws if it is no number: idOf()
// gives 0 then, which may be another row's id.
long long idForChange(const Json::Value& row);

}  // namespace oauthctl
