#include "oauth_db_basic.h"

#include <fcntl.h>
#include <sqlite3.h>
#include <sys/stat.h>
#include <unistd.h>

#include <boost/algorithm/string/replace.hpp>
#include <cerrno>
#include <cstring>
#include <utility>

#include "decimal_text.h"
#include "host_libraries.h"
#include "oauth_failure.h"
#include "oauth_names.h"
#include "oauth_syslog.h"
#include "oauth_transaction.h"
#include "row_form.h"
#include "sqlite_text.h"

namespace ZEVOOAUTHSERVER {
namespace {

// Raises the effective ids to root for the lifetime of the object.
//
// The group changes before the user, in both directions: to change it back the process needs root's
// user id. A refusal is logged; the guarded call is made all the same, with the ids that the
// process then has. Leaves errno 0, or 1 after a refusal. Process-wide: no other thread may depend
// on the ids meanwhile.
class RaisedPrivilege {
 public:
  RaisedPrivilege() : user_(geteuid()), group_(getegid()) {
    if ((group_ == kRoot || setGroup(kRoot)) && (user_ == kRoot || setUser(kRoot))) {
      errno = 0;
      return;
    }
    errno = 1;
    OAUTH_LOG(LOG_AUTH | LOG_ERR, "ERROR: ENTERCriticalSection");
    errno = 1;  // Sending the line may change errno.
  }
  ~RaisedPrivilege() {
    const bool user = geteuid() != user_;
    const bool group = getegid() != group_;
    if ((!user || setUser(kRoot)) && (!group || setGroup(group_)) && (!user || setUser(user_))) {
      errno = 0;
      return;
    }
    errno = 1;
    OAUTH_LOG(LOG_AUTH | LOG_ERR, "ERROR: LEAVECriticalSection");
    errno = 1;
  }
  RaisedPrivilege(const RaisedPrivilege&) = delete;
  RaisedPrivilege& operator=(const RaisedPrivilege&) = delete;

 private:
  static constexpr unsigned kRoot = 0;
  static constexpr unsigned kKeep = static_cast<unsigned>(-1);

  static bool setUser(unsigned id) { return report("resuid", id, setresuid(kKeep, id, kKeep)); }
  static bool setGroup(unsigned id) { return report("resgid", id, setresgid(kKeep, id, kKeep)); }

  // Logs a refusal, or that the process became root. A return to ordinary ids is not logged.
  static bool report(const char* call, unsigned id, int result) {
    const int target = static_cast<int>(id);
    if (result != 0) {
      char buffer[1024] = {};
      const char* const text = strerror_r(errno, buffer, sizeof buffer);
      OAUTH_LOG(LOG_AUTH | LOG_ERR, "ERROR: set%s(%d, %d, %d) [%s]", call, -1, target, -1, text);
      return false;
    }
    if (id == kRoot)
      OAUTH_LOG(LOG_AUTH | LOG_INFO, "WARNING: set%s(%d, %d, %d)", call, -1, target, -1);
    return true;
  }

  const unsigned user_, group_;
};

constexpr int kBusyTimeout = 5000;  // milliseconds

// True if there is something other than a regular file at the path. Root must not open it: the
// maker of a link would choose which file root opens.
bool holdsNoDatabase(const char* path) {
  struct stat status;
  return lstat(path, &status) == 0 && !S_ISREG(status.st_mode);
}

// Makes an empty file of mode 0600 that belongs to this user, if nothing has the name yet. SQLite
// would make it as root, with a mode that the umask decides.
void makeFile(const char* path, uid_t user, gid_t group) {
  constexpr mode_t kMode = S_IRUSR | S_IWUSR;
  const int file = open(path, O_WRONLY | O_CREAT | O_EXCL | O_CLOEXEC, kMode);
  if (file < 0) return;  // It exists, or sqlite3_open() reports what is wrong.
  fchmod(file, kMode);   // The umask may have removed bits.
  static_cast<void>(!fchown(file, user, group));  // If this fails, the file still belongs to root.
  close(file);
}

int openDatabase(sqlite3** db) {
  const char* const path = names::path::kDatabase;
  const uid_t user = geteuid();
  const gid_t group = getegid();
  errno = 0;
  if (!holdsNoDatabase(path)) {
    const RaisedPrivilege raised;
    const int error = errno;
    makeFile(path, user, group);
    // Look again as root, who can also see into folders that are closed to the program's user.
    const bool mayOpen = !holdsNoDatabase(path);
    errno = error;
    if (mayOpen) return sqlite3_open(path, db);
  }
  const int error = errno;
  const int result = sqlite3_open(path, db);
  errno = error;
  return result;
}

// Anybody who can write to the folder may have made the file. Refuse statements that change
// SQLite's own tables, and functions with side effects in views and triggers.
void distrustSchema(sqlite3* db) {
  sqlite3_db_config(db, SQLITE_DBCONFIG_DEFENSIVE, 1, nullptr);
  sqlite3_db_config(db, SQLITE_DBCONFIG_TRUSTED_SCHEMA, 0, nullptr);
}

using HostCipher = int (*)(const char* text, char* out, int outSize);

// Writes what the host's cipher returns for the text to out; false, without a change, if it fails.
bool convert(HostCipher cipher, const std::string& text, std::string& out) {
  char buffer[1024] = {};
  if (cipher(text.c_str(), buffer, sizeof buffer) == 0) return false;
  out.assign(buffer, strnlen(buffer, sizeof buffer - 1));
  return true;
}

// The host's texts end at a NUL byte: a value that holds one would come back cut.
bool EncryptValue(const std::string& plain, std::string& out) {
  const bool isWhole = plain.find('\0') == std::string::npos;
  if (isWhole && convert(ZOCLCryptSzEncrypt, plain, out)) return true;
  OAUTH_FAIL("Data Encrypt failed");
  return false;
}

bool DecryptValue(const std::string& cipher, std::string& out) {
  if (convert(ZOCLCryptSzDecrypt, cipher, out)) return true;
  OAUTH_FAIL("Data Decrypt failed");
  return false;
}

using ValueConverter = bool (*)(const std::string& text, std::string& out);

// A literal for each column: programs that capture the log may compare its formats.
void traceConversion(const char* operation, const char* column) {
  if (column == names::column::kClientId)
    OAUTH_DIAG(kResult, "==> %s[client_id]", operation);
  else
    OAUTH_DIAG(kResult, "==> %s[client_secret]", operation);
}

// Converts the encrypted columns among the document's members. The trace names the operation that
// was called. A document that is not an object, such as an absent condition, has no members.
bool replaceSensitive(Json::Value& doc, const char* operation, ValueConverter converter) {
  if (!doc.isObject()) return true;
  for (const char* const column : names::kEncryptedColumns) {
    if (!doc.isMember(column)) continue;
    traceConversion(operation, column);
    std::string replacement;
    if (!converter(doc[column].asString(), replacement)) return false;
    doc[column] = replacement;
  }
  return true;
}

// ParamDecrypt() without a store: the row callback has none.
bool decryptMembers(Json::Value& doc) {
  return replaceSensitive(doc, "ParamDecrypt", DecryptValue);
}

void dumpColumn(int index, const char* name, const char* value) {
  OAUTH_DIAG(kRow, "##### [%d][%s = %s]", index, name, textOrEmpty(value));
}

// Runs the body of a row callback. No exception may pass through SQLite, which is C. A row that
// cannot be delivered fails the statement (SQLITE_ABORT), so that no row is lost silently.
template <class Body>
int deliver(Body body) noexcept {
  try {
    body();
    return 0;
  } catch (...) {
    return 1;
  }
}

// The value between single quotes, with the quotes inside it doubled. A NUL byte stays in it:
// SQLite reads the statement only up to that byte, finds no closing quote, and refuses it. So no
// value is cut.
std::string sqlLiteral(const Json::Value& value) {
  std::string text = value.asString();
  boost::algorithm::replace_all(text, "'", "''");
  return "'" + text + "'";
}

}  // namespace

// --- Construction and schema ---

OAUTHDBBasic::OAUTHDBBasic() : OAUTHDBBasic(nullptr) {
  const int result = openDatabase(&db_);
  if (result != SQLITE_OK) {
    fail(*this, result, "Open DB failed!!");
    OAUTH_FAIL("Open DB failed!![%d]", result);
  } else {
    distrustSchema(db_);
    sqlite3_busy_timeout(db_, kBusyTimeout);
  }
  // Also after a failed open: SQLite returns a handle then too, and each failure on it is logged.
  DBInit();
}

OAUTHDBBasic::~OAUTHDBBasic() {
  if (db_ == nullptr) return;
  // A roll-back deletes files that the journal names, so it must not happen as root.
  if (sqlite3_get_autocommit(db_) == 0) DBCmdRun("ROLLBACK;", nullptr, nullptr);
  int result;
  {
    const RaisedPrivilege raised;
    result = sqlite3_close(db_);
  }
  if (result != SQLITE_OK) OAUTH_FAIL("Close DB failed!![%d]", result);
}

int OAUTHDBBasic::GetErrCode() const { return errCode_; }
void OAUTHDBBasic::SetErrCode(int code) { errCode_ = code; }
std::string OAUTHDBBasic::GetErrMsg() const { return errMsg_; }
void OAUTHDBBasic::SetErrMsg(const std::string& msg) { errMsg_ = msg; }
std::string OAUTHDBBasic::GetTabName() const { return tabName_; }
void OAUTHDBBasic::SetTabName(const std::string& name) { tabName_ = name; }

bool OAUTHDBBasic::DBInit() {
  if (db_ == nullptr) return ready_;
  const auto create = [this](const char* sql, const char* table) {
    if (CreateDBTab(sql)) return true;
    OAUTH_FAIL("Create Table failed!![%s]", table);
    return false;
  };

  OAUTH_DIAG(kEntry, "==> %s[init meta table]", __func__);
  if (!IsDBTabExist(names::table::kMeta) && !createMetaTable()) {
    fail(*this, kErrCreateTable, "Create table failed");
    OAUTH_FAIL("Create Table failed!![meta]");
    return ready_;
  }
  // Log filters rely on the classes: two of these five are entry traces and three are results.
  OAUTH_DIAG(kEntry, "==> %s[init client table]", __func__);
  if (!create(names::schema::kClientInfo, names::table::kClientInfo)) return ready_;
  OAUTH_DIAG(kResult, "==> %s[init token table]", __func__);
  if (!create(names::schema::kToken, names::table::kToken)) return ready_;
  OAUTH_DIAG(kResult, "==> %s[init grantCode table]", __func__);
  if (!create(names::schema::kGrantCode, names::table::kGrantCode)) return ready_;
  OAUTH_DIAG(kResult, "==> %s[init log table]", __func__);
  if (!create(names::schema::kLog, names::table::kLog)) return ready_;
  ready_ = true;
  return true;
}

// Several processes may find no table at the same time. The first one creates it. The others look
// again under the write lock and find it. (In the caller's own transaction the lock comes with the
// first change.) A look-up that fails there is a failure, not a missing table.
bool OAUTHDBBasic::createMetaTable() {
  Transaction transaction = Transaction::whileMakingReady(*this);
  bool exists = false;
  if (!transaction.begun() || !lookUpTable(names::table::kMeta, exists)) return false;
  return (exists || fillMetaTable()) && transaction.commitIfBegun();
}

// Counts the rows that were inserted: a view of that name can swallow them without an error.
bool OAUTHDBBasic::fillMetaTable() {
  if (!CreateDBTab(names::schema::kMeta)) return false;
  const int rowsBefore = sqlite3_total_changes(db_);
  AddMetaData();
  constexpr int kVersionedTables = 3;
  return sqlite3_total_changes(db_) - rowsBefore == kVersionedTables;
}

bool OAUTHDBBasic::CreateDBTab(const std::string& sql) {
  if (!DBCmdRun(sql, nullptr, nullptr)) return fail(*this, kErrCreateTable, "Create table failed");
  OAUTH_DIAG(kEntry, "Create tab success");
  return true;
}

// False if the look-up itself failed.
bool OAUTHDBBasic::lookUpTable(const std::string& name, bool& exists) {
  Json::Value probe;
  probe[names::result::kExist] = false;
  const std::string sql = "SELECT * FROM sqlite_master WHERE name='" + name + "' and type='table';";
  if (!DBCmdRun(sql, IsTabExistCallback, &probe)) return false;
  exists = probe[names::result::kExist].asBool();
  return true;
}

bool OAUTHDBBasic::IsDBTabExist(const std::string& name) {
  bool exists = false;
  if (!lookUpTable(name, exists) || !exists) return false;
  OAUTH_DIAG(kEntry, "Tab[%s] is exist", name.c_str());
  return true;
}

void OAUTHDBBasic::AddMetaData() {
  OAUTH_ENTER();
  const std::pair<const char*, const char*> versions[] = {
      {names::table::kClientInfo, names::version::kClientInfo},
      {names::table::kGrantCode, names::version::kGrantCode},
      {names::table::kToken, names::version::kToken},
  };
  for (const auto& [table, version] : versions) {
    const std::string sql = std::string("INSERT INTO ") + names::table::kMeta +
                            "(tab_name, version) VALUES('" + table + "', " + version + ");";
    if (!DBCmdRun(sql, nullptr, nullptr)) OAUTH_FAIL("Add Meta failed");
  }
}

bool OAUTHDBBasic::DBDrop() {
  OAUTH_ENTER();
  const bool ok = DBCmdRun("DROP TABLE IF EXISTS " + tabName_ + ";", nullptr, nullptr);
  // Unlike other failures this one is silent unless diagnostics are on.
  if (!ok) OAUTH_DIAG(kResult, "Drop [%s] failed", tabName_.c_str());
  return ok;
}

// --- Statements ---

bool OAUTHDBBasic::DBCmdRun(const std::string& sql, RowCallback callback, Json::Value* result) {
  OAUTH_DIAG(kEntry, "==> %s[%s]", __func__, sql.c_str());
  char* errorText = nullptr;
  const int code = sqlite3_exec(db_, sql.c_str(), callback, result, &errorText);
  const SqliteText error(errorText);
  if (code == SQLITE_OK) return true;
  // After a failed open SQLite returns a code without a text.
  const char* const text = textOrEmpty(error.get());
  fail(*this, code, text);
  OAUTH_FAIL("Run Command failed!![%s][%d]", text, code);
  return false;
}

bool OAUTHDBBasic::DBCmd(const std::string& sql, RowCallback callback, Json::Value* result) {
  OAUTH_ENTER();
  if (db_ != nullptr && ready_) return DBCmdRun(sql, callback, result);
  // The error state stays: it tells why the store is not ready.
  OAUTH_FAIL("DB is not ready!!");
  return false;
}

int OAUTHDBBasic::IsTabExistCallback(void* context, int columns, char** values,
                                     char** columnNames) {
  OAUTH_ENTER();
  for (int i = 0; i < columns; ++i) dumpColumn(i, columnNames[i], values[i]);
  return deliver([&] {
    if (context != nullptr) (*static_cast<Json::Value*>(context))[names::result::kExist] = true;
  });
}

int OAUTHDBBasic::TabCountCallback(void* context, int /*columns*/, char** values,
                                   char** /*columnNames*/) {
  OAUTH_ENTER();
  return deliver([&] {
    if (context != nullptr) static_cast<Json::Value*>(context)->append(textOrEmpty(values[0]));
  });
}

int OAUTHDBBasic::TabGetCallback(void* context, int columns, char** values, char** columnNames) {
  OAUTH_ENTER();
  return deliver([&] {
    for (int i = 0; i < columns; ++i) dumpColumn(i, columnNames[i], values[i]);
    Json::Value row = makeRow(columns, values, columnNames);
    if (!decryptMembers(row)) OAUTH_FAIL("Decrypt data failed");
    if (context != nullptr) static_cast<Json::Value*>(context)->append(std::move(row));
  });
}

bool OAUTHDBBasic::DBGetRowCount(Json::Value* result) {
  OAUTH_ENTER();
  if (result == nullptr) return OAUTH_REFUSE(kErrBadParameters, "Bad parameters");
  *result = Json::Value(Json::arrayValue);
  const std::string sql = "SELECT COUNT(*) FROM " + tabName_ + ";";
  if (DBCmd(sql, TabCountCallback, result)) return true;
  OAUTH_FAIL("Get Row Count failed[%s]", tabName_.c_str());
  return false;
}

bool OAUTHDBBasic::DBCheckRowMax(unsigned long max) {
  OAUTH_ENTER();
  Json::Value rows;
  if (!DBGetRowCount(&rows)) {
    OAUTH_FAIL("Check Row Max failed[%s]", tabName_.c_str());
    return false;
  }
  const auto count = static_cast<unsigned long>(decimalValue(rows[0U]));
  OAUTH_DIAG(kResult, "Table Row Count[%lu]", count);
  return count < max;
}

// --- Request to SQL ---

std::string OAUTHDBBasic::GetInsertParam(const Json::Value& record) {
  OAUTH_ENTER();
  std::string columns, values;
  for (auto member = record.begin(); member != record.end(); ++member) {
    if (!columns.empty()) {
      columns += ", ";
      values += ", ";
    }
    columns += member.name();
    if (!member->isNull())
      values += sqlLiteral(*member);
    else if (member.name() == names::column::kTimestamp)
      values += "strftime('%s','now')";
    else
      values += "NULL";
  }
  return " (" + columns + ") VALUES(" + values + ")";
}

std::string OAUTHDBBasic::ConcateParam(const Json::Value& values, const std::string& separator) {
  OAUTH_ENTER();
  std::string result;
  for (auto member = values.begin(); member != values.end(); ++member) {
    if (!result.empty()) result += separator;
    result += member.name() + "=" + sqlLiteral(*member);
  }
  return result;
}

std::string OAUTHDBBasic::GetConditionParam(const Json::Value& condition) {
  OAUTH_ENTER();
  // An array is not a condition. Build a statement that SQLite rejects, not one that matches
  // every row.
  if (condition.empty() && !condition.isArray()) return {};
  return " WHERE " + ConcateParam(condition, " and ");
}

std::string OAUTHDBBasic::GetUpdateParam(const Json::Value& request) {
  OAUTH_ENTER();
  // Two statements: the operands of one sum would be evaluated, and traced, in any order.
  const std::string modified = ConcateParam(request[names::request::kModified], ", ");
  const std::string condition = GetConditionParam(request[names::request::kCondition]);
  return " SET " + modified + condition;
}

// --- Record operations ---

bool OAUTHDBBasic::DBAdd(Json::Value& record) {
  OAUTH_ENTER();
  if (!ParamEncrypt(record)) return fail(*this, kErrCrypt, "Data Encrypt failed");
  if (!DBCmd("INSERT INTO " + tabName_ + GetInsertParam(record) + ";", nullptr, nullptr)) {
    OAUTH_FAIL("Add failed[%s]", tabName_.c_str());
    return false;
  }
  OAUTH_DIAG(kResult, "[%s] Add success, changed[%d]", tabName_.c_str(), sqlite3_changes(db_));
  return true;
}

bool OAUTHDBBasic::DBDel(Json::Value& request) {
  OAUTH_ENTER();
  Json::Value& condition = request[names::request::kCondition];
  if (!ParamEncrypt(condition)) return fail(*this, kErrCrypt, "Data Encrypt failed");
  const std::string sql = "DELETE FROM " + tabName_ + GetConditionParam(condition) + ";";
  if (!DBCmd(sql, nullptr, nullptr) || sqlite3_changes(db_) <= 0) {
    OAUTH_FAIL("Delete failed[%s]", tabName_.c_str());
    return false;
  }
  // Log filters rely on "ClientInfo" here and below, whatever the table is.
  OAUTH_DIAG(kResult, "ClientInfo Delete success, changed[%d]", sqlite3_changes(db_));
  return true;
}

bool OAUTHDBBasic::DBGet(Json::Value& request, Json::Value* rows) {
  OAUTH_ENTER();
  if (rows == nullptr) return OAUTH_REFUSE(kErrBadParameters, "Bad parameters");
  Json::Value& condition = request[names::request::kCondition];
  // Callers know a failed read by this text.
  if (!ParamEncrypt(condition)) return fail(*this, kErrCrypt, "Data Decrypt failed");
  *rows = Json::Value(Json::arrayValue);
  std::string sql = "SELECT * FROM " + tabName_;
  if (request.isMember(names::request::kConditionLike))
    sql += " WHERE " + request[names::request::kConditionLike].asString();
  else
    sql += GetConditionParam(condition);
  // Read through a const reference, so that an absent option is not added to the request.
  sql += " " + std::as_const(request)[names::request::kOption].asString() + ";";
  if (!DBCmd(sql, TabGetCallback, rows)) {
    OAUTH_FAIL("Get failed[%s]", tabName_.c_str());
    return false;
  }
  OAUTH_DIAG(kResult, "ClientInfo Get Done");
  return true;
}

bool OAUTHDBBasic::DBEdit(Json::Value& request) {
  OAUTH_ENTER();
  if (!ParamEncrypt(request[names::request::kCondition]) ||
      !ParamEncrypt(request[names::request::kModified]))
    return fail(*this, kErrCrypt, "Data Encrypt failed");
  const std::string sql = "UPDATE " + tabName_ + GetUpdateParam(request) + ";";
  if (!DBCmd(sql, nullptr, nullptr) || sqlite3_changes(db_) <= 0) {
    OAUTH_FAIL("Edit failed[%s]", tabName_.c_str());
    return false;
  }
  OAUTH_DIAG(kResult, "ClientInfo Edit success, changed[%d]", sqlite3_changes(db_));
  return true;
}

// --- Sensitive values ---

bool OAUTHDBBasic::ParamEncrypt(Json::Value& doc) {
  return replaceSensitive(doc, __func__, EncryptValue);
}
bool OAUTHDBBasic::ParamDecrypt(Json::Value& doc) { return decryptMembers(doc); }

}  // namespace ZEVOOAUTHSERVER
