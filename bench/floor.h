/* Does by hand what the library does: runs the same statements on the same file with the same
 * durability. It has no JSON, settings, encryption, checks of arguments or logging.
 *
 * Functions return 1 on success and 0 on failure. */

#pragma once

#include <sqlite3.h>
#include <stddef.h>

#ifdef __cplusplus
extern "C" {
#endif

/* Opens the database and creates missing tables; NULL on failure. */
sqlite3* floor_open(void);
int floor_close(sqlite3* db);

/* Writes 64 hexadecimal digits and a NUL byte: two version-4 UUIDs without hyphens. */
int floor_random(char out[65]);
/* Reads the whole settings file and does not parse it. */
int floor_settings(void);

struct floor_grant {
  const char *username, *client_id, *scope, *flow_type, *state, *ip;
};
struct floor_client {
  const char *redirect_uri, *scope, *display_name;
};

/* Rows in memory. Each row has one block, which holds the texts of its columns. */
enum { FLOOR_COLUMNS = 10 };
struct floor_row {
  char* column[FLOOR_COLUMNS]; /* the first one points to the block */
};
struct floor_rows {
  struct floor_row* row;
  size_t count, room;
};
void floor_free(struct floor_rows* rows);

/* Delivers user, scope and state of a valid token: one row of three columns. */
int floor_verify(sqlite3* db, const char* access_token, struct floor_rows* out);
int floor_issue(sqlite3* db, const struct floor_grant* grant, int row_max);
int floor_find_refresh_token(sqlite3* db, const char* refresh_token, struct floor_rows* out);
int floor_read_tokens(sqlite3* db, struct floor_rows* out);
int floor_purge_tokens(sqlite3* db);
int floor_register(sqlite3* db, const struct floor_client* client, int row_max, int log_max);
int floor_issue_code(sqlite3* db, const struct floor_grant* grant, int row_max, char code[65]);
int floor_find_code(sqlite3* db, const char* code, struct floor_rows* out);
int floor_log(sqlite3* db, const char* message, int log_max);

/* The statements of a program that keeps the database open and prepares them once. */
struct floor_statements {
  sqlite3_stmt *verify, *count, *issue;
};
int floor_prepare(sqlite3* db, struct floor_statements* statements);
void floor_finalize(struct floor_statements* statements);
int floor_verify_prepared(const struct floor_statements* statements, const char* access_token,
                          struct floor_rows* out);
int floor_issue_prepared(const struct floor_statements* statements, const struct floor_grant* grant,
                         int row_max);

#ifdef __cplusplus
}
#endif
