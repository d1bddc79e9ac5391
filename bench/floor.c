#include "floor.h"

#include <fcntl.h>
#include <stdio.h>
#include <stdlib.h>
#include <string.h>
#include <sys/stat.h>
#include <time.h>
#include <unistd.h>

static const char database[] = "/var/packages/Keyloft/target/etc/oauth.db";
static const char settings[] = "/var/packages/Keyloft/target/etc/oauth.cfg";

enum { BUSY_TIMEOUT = 5000, LIFETIME = 600 };

/* --- Open and close --- */

static int set_flag(void* flag, int columns, char** values, char** names) {
  (void)columns, (void)values, (void)names;
  *(int*)flag = 1;
  return 0;
}

static int run(sqlite3* db, const char* sql) {
  return sqlite3_exec(db, sql, NULL, NULL, NULL) == SQLITE_OK;
}

static int make_tables(sqlite3* db) {
  static const char* const tables[] = {
      "CREATE TABLE IF NOT EXISTS oauth_clientInfo"
      "(enable text NOT NULL, client_id text NOT NULL UNIQUE, client_secret text NOT NULL, "
      "redirect_uri text NOT NULL, scope text NOT NULL, display_name text NOT NULL, "
      "id integer PRIMARY KEY);",
      "CREATE TABLE IF NOT EXISTS oauth_token"
      "(username text NOT NULL,  client_id text NOT NULL,  scope text NOT NULL,  "
      "refresh_token text NOT NULL, access_token text NOT NULL UNIQUE, "
      "expired_time text NOT NULL, flow_type text NOT NULL, state text NOT NULL, "
      "ip text NOT NULL DEFAULT 'None', id integer PRIMARY KEY);",
      "CREATE TABLE IF NOT EXISTS oauth_grantCode"
      "(username text NOT NULL, client_id text NOT NULL, scope text NOT NULL, "
      "code text NOT NULL UNIQUE, expired_time text NOT NULL, state text NOT NULL, "
      "ip text NOT NULL DEFAULT 'None', id integer PRIMARY KEY);",
      "CREATE TABLE IF NOT EXISTS oauth_log"
      "(timestamp integer NOT NULL, msg text NOT NULL, id integer PRIMARY KEY);"};
  int known = 0;
  if (sqlite3_exec(db, "SELECT * FROM sqlite_master WHERE name='oauth_meta' and type='table';",
                   set_flag, &known, NULL) != SQLITE_OK ||
      !known)
    return 0;
  for (size_t i = 0; i < sizeof tables / sizeof tables[0]; ++i)
    if (!run(db, tables[i])) return 0;
  return 1;
}

sqlite3* floor_open(void) {
  sqlite3* db = NULL;
  if (sqlite3_open(database, &db) == SQLITE_OK) {
    sqlite3_busy_timeout(db, BUSY_TIMEOUT);
    if (make_tables(db)) return db;
  }
  sqlite3_close(db);
  return NULL;
}

int floor_close(sqlite3* db) { return sqlite3_close(db) == SQLITE_OK; }

/* --- Without a database --- */

int floor_random(char out[65]) {
  static const char digits[] = "0123456789abcdef";
  unsigned char bytes[32];
  const int device = open("/dev/urandom", O_RDONLY | O_CLOEXEC);
  if (device < 0) return 0;
  const ssize_t count = read(device, bytes, sizeof bytes);
  close(device);
  if (count != (ssize_t)sizeof bytes) return 0;
  for (int uuid = 0; uuid < 32; uuid += 16) {
    bytes[uuid + 6] = (unsigned char)((bytes[uuid + 6] & 0x0f) | 0x40);
    bytes[uuid + 8] = (unsigned char)((bytes[uuid + 8] & 0x3f) | 0x80);
  }
  for (int i = 0; i < 32; ++i) {
    out[2 * i] = digits[bytes[i] >> 4];
    out[2 * i + 1] = digits[bytes[i] & 0x0f];
  }
  out[64] = '\0';
  return 1;
}

int floor_settings(void) {
  struct stat status;
  ssize_t count = -1;
  const int file = open(settings, O_RDONLY | O_CLOEXEC);
  if (file < 0) return 0;
  if (fstat(file, &status) == 0) {
    char* const text = malloc((size_t)status.st_size);
    if (text != NULL) count = read(file, text, (size_t)status.st_size);
    free(text);
  }
  close(file);
  return count > 0;
}

/* --- Statements --- */

static int prepare(sqlite3* db, const char* sql, sqlite3_stmt** statement) {
  return sqlite3_prepare_v2(db, sql, -1, statement, NULL) == SQLITE_OK;
}

static int finalize(sqlite3_stmt* statement, int done) {
  return sqlite3_finalize(statement) == SQLITE_OK && done;
}

static void bind(sqlite3_stmt* statement, int index, const char* text) {
  sqlite3_bind_text(statement, index, text, -1, SQLITE_STATIC);
}

static const char* text_of(sqlite3_stmt* statement, int column) {
  return (const char*)sqlite3_column_text(statement, column);
}

/* Copies the wanted columns of the statement's current row. */
static int add_row(sqlite3_stmt* statement, const int* wanted, int columns,
                   struct floor_rows* rows) {
  const char* text[FLOOR_COLUMNS];
  size_t size[FLOOR_COLUMNS], total = 0;
  if (rows->count == rows->room) {
    const size_t room = rows->room == 0 ? 16 : 2 * rows->room;
    void* const grown = realloc(rows->row, room * sizeof *rows->row);
    if (grown == NULL) return 0;
    rows->row = grown;
    rows->room = room;
  }
  for (int i = 0; i < columns; ++i) {
    text[i] = text_of(statement, wanted[i]);
    size[i] = (size_t)sqlite3_column_bytes(statement, wanted[i]) + 1;
    total += size[i];
  }
  char* place = malloc(total);
  if (place == NULL) return 0;
  struct floor_row* const row = &rows->row[rows->count++];
  for (int i = 0; i < columns; ++i) {
    row->column[i] = memcpy(place, text[i], size[i]);
    place += size[i];
  }
  return 1;
}

void floor_free(struct floor_rows* rows) {
  for (size_t i = 0; i < rows->count; ++i) free(rows->row[i].column[0]);
  free(rows->row);
  memset(rows, 0, sizeof *rows);
}

/* Copies every row that the statement delivers, with all columns. */
static int collect(sqlite3_stmt* statement, struct floor_rows* out) {
  static const int all[FLOOR_COLUMNS] = {0, 1, 2, 3, 4, 5, 6, 7, 8, 9};
  const int columns = sqlite3_column_count(statement);
  int code;
  while ((code = sqlite3_step(statement)) == SQLITE_ROW)
    if (!add_row(statement, all, columns, out)) return 0;
  return code == SQLITE_DONE;
}

static int collect_where(sqlite3* db, const char* sql, const char* value, struct floor_rows* out) {
  sqlite3_stmt* statement = NULL;
  if (!prepare(db, sql, &statement)) return 0;
  if (value != NULL) bind(statement, 1, value);
  return finalize(statement, collect(statement, out));
}

static int has_room(sqlite3_stmt* count, int row_max) {
  return sqlite3_step(count) == SQLITE_ROW && sqlite3_column_int(count, 0) < row_max;
}

static int check_room(sqlite3* db, const char* sql, int row_max) {
  sqlite3_stmt* count = NULL;
  return prepare(db, sql, &count) && finalize(count, has_room(count, row_max));
}

static void print_expiry(char out[24]) {
  snprintf(out, 24, "%lld", (long long)time(NULL) + LIFETIME);
}

/* --- Tokens --- */

static const char verify_sql[] = "SELECT * FROM oauth_token WHERE access_token=?1;";
static const char count_sql[] = "SELECT COUNT(*) FROM oauth_token;";
static const char issue_sql[] =
    "INSERT INTO oauth_token (access_token, client_id, expired_time, flow_type, id, ip, "
    "refresh_token, scope, state, username) VALUES(?1, ?2, ?3, ?4, NULL, ?5, ?6, ?7, ?8, ?9);";

enum { USERNAME = 0, SCOPE = 2, EXPIRED_TIME = 5, STATE = 7, ID = 9 }; /* columns of a token */

static int verify(sqlite3_stmt* statement, const char* access_token, struct floor_rows* out) {
  static const int wanted[] = {USERNAME, SCOPE, STATE};
  bind(statement, 1, access_token);
  if (sqlite3_step(statement) != SQLITE_ROW) return 0;
  if (time(NULL) > strtoll(text_of(statement, EXPIRED_TIME), NULL, 10)) return 0;
  if (!add_row(statement, wanted, 3, out)) return 0;
  return sqlite3_step(statement) == SQLITE_DONE;
}

int floor_verify(sqlite3* db, const char* access_token, struct floor_rows* out) {
  sqlite3_stmt* statement = NULL;
  return prepare(db, verify_sql, &statement) &&
         finalize(statement, verify(statement, access_token, out));
}

static int issue(sqlite3_stmt* insert, const struct floor_grant* grant) {
  char expiry[24], access_token[65], refresh_token[65];
  print_expiry(expiry);
  if (!floor_random(access_token) || !floor_random(refresh_token)) return 0;
  bind(insert, 1, access_token);
  bind(insert, 2, grant->client_id);
  bind(insert, 3, expiry);
  bind(insert, 4, grant->flow_type);
  bind(insert, 5, grant->ip);
  bind(insert, 6, refresh_token);
  bind(insert, 7, grant->scope);
  bind(insert, 8, grant->state);
  bind(insert, 9, grant->username);
  return sqlite3_step(insert) == SQLITE_DONE;
}

int floor_issue(sqlite3* db, const struct floor_grant* grant, int row_max) {
  sqlite3_stmt* insert = NULL;
  return check_room(db, count_sql, row_max) && prepare(db, issue_sql, &insert) &&
         finalize(insert, issue(insert, grant));
}

int floor_find_refresh_token(sqlite3* db, const char* refresh_token, struct floor_rows* out) {
  return collect_where(db, "SELECT * FROM oauth_token WHERE refresh_token=?1;", refresh_token, out);
}

int floor_read_tokens(sqlite3* db, struct floor_rows* out) {
  return collect_where(db, "SELECT * FROM oauth_token;", NULL, out);
}

/* Finds all expired rows before the first deletion, as the library does. So no row is deleted while
 * a statement still reads. */
static int find_expired(sqlite3* db, sqlite3_int64** ids, size_t* count) {
  const sqlite3_int64 now = time(NULL);
  sqlite3_stmt* read = NULL;
  size_t room = 0;
  int code;
  if (!prepare(db, "SELECT * FROM oauth_token;", &read)) return 0;
  while ((code = sqlite3_step(read)) == SQLITE_ROW) {
    if (now <= strtoll(text_of(read, EXPIRED_TIME), NULL, 10)) continue;
    if (*count == room) {
      room = room == 0 ? 64 : 2 * room;
      void* const grown = realloc(*ids, room * sizeof **ids);
      if (grown == NULL) break;
      *ids = grown;
    }
    (*ids)[(*count)++] = sqlite3_column_int64(read, ID);
  }
  return finalize(read, code == SQLITE_DONE);
}

/* Deletes each row by a statement of its own, as the library does. */
static int delete_rows(sqlite3* db, const sqlite3_int64* ids, size_t count) {
  char sql[64];
  int done = 1;
  for (size_t i = 0; done && i < count; ++i) {
    snprintf(sql, sizeof sql, "DELETE FROM oauth_token WHERE id='%lld';", (long long)ids[i]);
    done = run(db, sql);
  }
  return done;
}

int floor_purge_tokens(sqlite3* db) {
  sqlite3_int64* ids = NULL;
  size_t count = 0;
  if (!run(db, "BEGIN IMMEDIATE;")) return 0;
  const int done =
      find_expired(db, &ids, &count) && delete_rows(db, ids, count) && run(db, "COMMIT;");
  free(ids);
  return done;
}

/* --- Clients, codes and the audit log --- */

int floor_log(sqlite3* db, const char* message, int log_max) {
  static const char trim[] =
      "DELETE FROM oauth_log WHERE timestamp IN "
      "(SELECT timestamp FROM oauth_log ORDER BY timestamp DESC LIMIT -1 OFFSET ?1)";
  sqlite3_stmt* statement = NULL;
  if (!prepare(db,
               "INSERT INTO oauth_log (id, msg, timestamp) VALUES(NULL, ?1, strftime('%s','now'));",
               &statement))
    return 0;
  bind(statement, 1, message);
  if (!finalize(statement, sqlite3_step(statement) == SQLITE_DONE)) return 0;
  if (!prepare(db, trim, &statement)) return 0;
  sqlite3_bind_int(statement, 1, log_max);
  return finalize(statement, sqlite3_step(statement) == SQLITE_DONE);
}

static int insert_client(sqlite3* db, const struct floor_client* client) {
  sqlite3_stmt* insert = NULL;
  char client_id[65], client_secret[65];
  if (!floor_random(client_id) || !floor_random(client_secret)) return 0;
  if (!prepare(db,
               "INSERT INTO oauth_clientInfo (client_id, client_secret, display_name, enable, id, "
               "redirect_uri, scope) VALUES(?1, ?2, ?3, '1', NULL, ?4, ?5);",
               &insert))
    return 0;
  bind(insert, 1, client_id);
  bind(insert, 2, client_secret);
  bind(insert, 3, client->display_name);
  bind(insert, 4, client->redirect_uri);
  bind(insert, 5, client->scope);
  return finalize(insert, sqlite3_step(insert) == SQLITE_DONE);
}

/* The audit log is a store of its own, with a connection of its own. */
int floor_register(sqlite3* db, const struct floor_client* client, int row_max, int log_max) {
  char message[128];
  sqlite3* const log = floor_open();
  if (log == NULL) return 0;
  snprintf(message, sizeof message, "Application registed[%s]", client->display_name);
  const int done = check_room(db, "SELECT COUNT(*) FROM oauth_clientInfo;", row_max) &&
                   insert_client(db, client) && floor_log(log, message, log_max);
  return floor_close(log) && done;
}

int floor_issue_code(sqlite3* db, const struct floor_grant* grant, int row_max, char code[65]) {
  sqlite3_stmt* insert = NULL;
  char expiry[24];
  print_expiry(expiry);
  if (!floor_random(code) || !check_room(db, "SELECT COUNT(*) FROM oauth_grantCode;", row_max))
    return 0;
  if (!prepare(db,
               "INSERT INTO oauth_grantCode (client_id, code, expired_time, id, ip, scope, state, "
               "username) VALUES(?1, ?2, ?3, NULL, ?4, ?5, ?6, ?7);",
               &insert))
    return 0;
  bind(insert, 1, grant->client_id);
  bind(insert, 2, code);
  bind(insert, 3, expiry);
  bind(insert, 4, grant->ip);
  bind(insert, 5, grant->scope);
  bind(insert, 6, grant->state);
  bind(insert, 7, grant->username);
  return finalize(insert, sqlite3_step(insert) == SQLITE_DONE);
}

int floor_find_code(sqlite3* db, const char* code, struct floor_rows* out) {
  return collect_where(db, "SELECT * FROM oauth_grantCode WHERE code=?1;", code, out);
}

/* --- A store held open --- */

int floor_prepare(sqlite3* db, struct floor_statements* statements) {
  return prepare(db, verify_sql, &statements->verify) &&
         prepare(db, count_sql, &statements->count) && prepare(db, issue_sql, &statements->issue);
}

void floor_finalize(struct floor_statements* statements) {
  sqlite3_finalize(statements->verify);
  sqlite3_finalize(statements->count);
  sqlite3_finalize(statements->issue);
}

int floor_verify_prepared(const struct floor_statements* statements, const char* access_token,
                          struct floor_rows* out) {
  const int valid = verify(statements->verify, access_token, out);
  return sqlite3_reset(statements->verify) == SQLITE_OK && valid;
}

int floor_issue_prepared(const struct floor_statements* statements, const struct floor_grant* grant,
                         int row_max) {
  const int room = has_room(statements->count, row_max);
  if (sqlite3_reset(statements->count) != SQLITE_OK || !room) return 0;
  const int done = issue(statements->issue, grant);
  return sqlite3_reset(statements->issue) == SQLITE_OK && done;
}
