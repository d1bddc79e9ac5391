/// \file
/// Base of every store: one SQLite connection to the database file, the schema, and the generic
/// record operations that the stores build on.

#pragma once

#include <json/value.h>

#include <string>

struct sqlite3;

#pragma GCC visibility push(default)
/// All classes and functions of the library.
namespace ZEVOOAUTHSERVER {

/// \name Error codes
/// Values of GetErrCode(). Any positive value other than kErrNone is an SQLite result code, with
/// SQLite's own text in GetErrMsg(), or "Open DB failed!!" when the file could not be opened.
/// \{
inline constexpr int kErrNone = 255;          ///< "": no failure recorded since construction
inline constexpr int kErrCreateTable = -1;    ///< "Create table failed"
inline constexpr int kErrBadParameters = -2;  ///< "Bad parameters"
inline constexpr int kErrTokenExpired = -3;   ///< "Access Token Expired", in a result document only
inline constexpr int kErrCrypt = -4;          ///< "Data Encrypt failed" or "Data Decrypt failed"
inline constexpr int kErrTableFull = -5;      ///< "... Table is full", with the store's name
/// \}

/// The base of the four stores.
///
/// A store opens the database on construction, creates the tables that are missing, and closes the
/// database on destruction. So keep an object only for the work at hand. Use it from one thread at
/// a time.
///
/// Opening and closing raise the effective user and group id of the whole process to root for that
/// one call: no other thread may depend on the ids meanwhile. If a link or anything else that is
/// not a regular file is in the database's place, it is opened without raised ids. Compare
/// geteuid() and getegid() afterwards if the system might refuse to restore the ids.
///
/// Many processes may use the file at once: each statement waits up to 5 seconds for the others
/// and then fails with SQLite's code 5, "database is locked".
///
/// Operations return true, or non-zero, on success. A failure leaves its reason in GetErrCode() and
/// GetErrMsg(), unless a comment says "log only". A success leaves the previous error there.
///
/// Two failures of every operation are log only: there was no row to change or delete, or the store
/// is not ready. The error of a store that is not ready tells why. (But Add() of clients, codes and
/// tokens then leaves kErrTableFull, because it cannot count the rows. So look at GetErrCode()
/// after the construction.)
///
/// All operations use two document shapes. Rows have numbers as decimal text, and "client_id" and
/// "client_secret" decrypted:
///
///     [ {"<column>": string, ...}, ... ]
///
/// Requests:
///
///     {"condition": {"<column>": string or integer, ...},   all must be equal
///      "condition_like": string,    SQL condition, replaces "condition"
///      "option": string,            SQL after the condition
///      "modified": {"<column>": string, ...}}               columns to write
///
/// "condition_like", "option" and the names of columns and tables are put into the statement as
/// they are: never pass a user's text there. If a value holds a NUL byte, SQLite refuses the
/// statement (code 1, "unrecognized token"); in "client_id" and "client_secret" the failure is
/// kErrCrypt.
class OAUTHDBBasic {
 public:
  /// Row callback, as sqlite3_exec() calls it; context is the result document.
  using RowCallback = int (*)(void* context, int columns, char** values, char** columnNames);

  /// Opens and initialises the database. A new database has mode 0600 and belongs to the program's
  /// own user. A database failure never throws: the error is recorded, and every later operation on
  /// records fails with the log line "DB is not ready!!".
  OAUTHDBBasic();
  /// Closes the database. A transaction that is still open is rolled back.
  ~OAUTHDBBasic();
  /// A store owns its connection and cannot be copied.
  OAUTHDBBasic(const OAUTHDBBasic&) = delete;
  OAUTHDBBasic& operator=(const OAUTHDBBasic&) = delete;  ///< Nor assigned.

  /// Code of the last failure: kErrNone, another of the codes in this header, or SQLite's.
  int GetErrCode() const;
  /// Replaces the code, for example to distinguish the next failure from an earlier one.
  void SetErrCode(int code);
  /// Text of the last failure.
  std::string GetErrMsg() const;
  /// Replaces the text.
  void SetErrMsg(const std::string& msg);

  /// The one table this store serves.
  std::string GetTabName() const;
  /// Makes the store serve another table.
  void SetTabName(const std::string& name);

  /// \name Schema
  /// These run before the store is ready.
  /// \{

  /// Creates the tables that are missing. The meta table and its schema-version rows are created
  /// together or not at all, as part of the caller's transaction if one is open. Returns true when
  /// all five tables exist; kErrCreateTable on failure.
  bool DBInit();
  /// Runs one CREATE statement; kErrCreateTable on failure.
  bool CreateDBTab(const std::string& sql);
  /// Whether there is a table of that name. Also false if the look-up failed; the error state then
  /// tells why.
  bool IsDBTabExist(const std::string& name);
  /// Writes the schema-version rows. A row that cannot be written is logged and skipped.
  void AddMetaData();
  /// Drops this store's table; the store stays ready.
  bool DBDrop();

  /// \}
  /// \name Statements
  /// \{

  /// Runs SQL; callback and result may be null. On failure the error state holds SQLite's code and
  /// text, and result holds the rows that were delivered before.
  bool DBCmdRun(const std::string& sql, RowCallback callback, Json::Value* result);
  /// The same, but fails if the store is not ready (log only).
  bool DBCmd(const std::string& sql, RowCallback callback, Json::Value* result);

  /// \}
  /// \name Row callbacks
  /// context is a Json::Value* and may be null. A callback returns 0, or non-zero if it cannot
  /// deliver the row; the statement then fails. It never throws.
  /// \{

  /// Sets {"exist": true} for any row.
  static int IsTabExistCallback(void* context, int columns, char** values, char** columnNames);
  /// Appends the first column as a string.
  static int TabCountCallback(void* context, int columns, char** values, char** columnNames);
  /// Appends the row as an object of strings, decrypted; an SQL NULL becomes "". A value that
  /// cannot be decrypted is delivered as it is stored (log only).
  static int TabGetCallback(void* context, int columns, char** values, char** columnNames);

  /// \}
  /// \name Row count
  /// \{

  /// Counts the rows of the table: result becomes [ string ], the count as decimal text.
  /// kErrBadParameters if result is null.
  bool DBGetRowCount(Json::Value* result);
  /// Whether the table holds fewer than max rows. Also false if the rows cannot be counted.
  bool DBCheckRowMax(unsigned long max);

  /// \}
  /// \name Fragments of SQL made from requests
  /// Members come in ascending byte order of their names. Single quotes in values are doubled; all
  /// other bytes stay, including NUL. Names are inserted as they are.
  /// \{

  /// The columns and values of an INSERT. A null "timestamp" becomes the current time of SQLite.
  ///
  ///     {"a": "1", "id": null} -> " (a, id) VALUES('1', NULL)"
  std::string GetInsertParam(const Json::Value& record);
  /// The members as assignments or comparisons.
  ///
  ///     {"a": "1", "b": "2"} -> "a='1'<separator>b='2'"
  std::string ConcateParam(const Json::Value& values, const std::string& separator);
  /// The WHERE of a condition.
  ///
  ///     {"a": "1", "b": "2"} -> " WHERE a='1' and b='2'"
  ///     nothing -> ""
  std::string GetConditionParam(const Json::Value& condition);
  /// The SET and WHERE of a request.
  ///
  ///     request -> " SET <modified> WHERE <condition>"
  std::string GetUpdateParam(const Json::Value& request);

  /// \}
  /// \name Record operations
  /// They change the document passed in: sensitive values are encrypted in place, and an absent
  /// "condition" or "modified" is added as null. If a value cannot be encrypted, the failure is
  /// kErrCrypt and the database is not touched.
  /// \{

  /// Inserts a record.
  ///
  ///     {"<column>": string or null, ...}
  bool DBAdd(Json::Value& record);
  /// Deletes the rows that match "condition", or every row if there is none. Fails if there was no
  /// row to delete.
  bool DBDel(Json::Value& request);
  /// Reads the rows that match "condition_like", or else "condition", into *rows. It succeeds if no
  /// row matches. kErrBadParameters if rows is null.
  bool DBGet(Json::Value& request, Json::Value* rows);
  /// Writes "modified" into the rows that match "condition", or every row if there is none. Fails
  /// if there was no row to change.
  bool DBEdit(Json::Value& request);

  /// \}
  /// \name Sensitive values
  /// These convert the members "client_id" and "client_secret" of a document. They stop at the
  /// first failure and leave the rest as it was (log only).
  /// \{

  /// Replaces them by their encrypted forms. Fails for a value that holds a NUL byte.
  bool ParamEncrypt(Json::Value& doc);
  /// Replaces them by their plain forms.
  bool ParamDecrypt(Json::Value& doc);

  /// \}

 private:
  friend class Transaction;

  // The public constructor delegates to this one first, so that the destructor closes the
  // connection when a later step of the construction throws.
  explicit OAUTHDBBasic(sqlite3* db) : db_(db) {}

  bool lookUpTable(const std::string& name, bool& exists);
  bool createMetaTable();
  bool fillMetaTable();

  int errCode_ = kErrNone;
  bool ready_ = false;
  std::string errMsg_;
  std::string tabName_;
  sqlite3* db_;
};

}  // namespace ZEVOOAUTHSERVER
#pragma GCC visibility pop
