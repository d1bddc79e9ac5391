// The database through the library: one connection for one command. Failures are thrown.

#pragma once

#include <json/value.h>

#include <functional>
#include <memory>
#include <string>

#include "database/access.h"
#include "oauth_db_basic.h"
#include "oauth_names.h"

namespace oauthctl {

namespace names = ZEVOOAUTHSERVER::names;

// Throws a Failure unless the store is ready for use.
void requireReady(const ZEVOOAUTHSERVER::OAUTHDBBasic& store);
// Throws a Failure that says why the last operation of the store failed.
[[noreturn]] void throwReason(const ZEVOOAUTHSERVER::OAUTHDBBasic& store,
                              const std::string& operation);
// Runs an operation of a store. True if it succeeded, false if there was no such row; throws if it
// failed for any other reason.
bool attempt(ZEVOOAUTHSERVER::OAUTHDBBasic& store, const std::string& operation,
             const std::function<bool()>& body);

// Throws the Failure for a row that is not the one that was read before. The text names that one.
[[noreturn]] void throwChangedMeanwhile(const std::string& text);

class Database {
 public:
  explicit Database(Access access);

  // Every row, or those whose columns have these values. Quote a text as the library did before it
  // stored it.
  Json::Value rows(const char* table, const Json::Value& condition = Json::nullValue);
  int rowCount(const char* table);
  // False if there is no such row.
  bool remove(const char* table, long long id);
  bool edit(const char* table, long long id, const Json::Value& modified);

  // Commits all changes of the body, or none if it throws. Takes the write lock first: no other
  // program changes a row between a read and a change in the body.
  void inTransaction(const std::function<void()>& body);

 private:
  void run(const std::string& sql);

  std::unique_ptr<ZEVOOAUTHSERVER::OAUTHDBBasic> store_;
};

// The text before the library doubled its single quotes.
std::string originalText(const std::string& stored);

// A row's id, which is stored as decimal text; 0 if it is not a number.
long long idOf(const Json::Value& row);
// The id for a document: a number, or the stored text if it is not a number.
Json::Value idValue(const Json::Value& row);
// The id of a row that is to be changed or deleted. Throws if it is not a number: idOf() returns 0
// then, which may be the id of another row.
long long idForChange(const Json::Value& row);

}  // namespace oauthctl
