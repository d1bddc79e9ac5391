#!/usr/bin/env bash
# Checks that a page of docs/reference has all messages or all tables of the sources, and no others.
#
#   reference_pages_test.sh messages|database-format
set -euo pipefail
cd "$(dirname "$0")/.."

# Prints the sources as one line, without comments. Adjacent string literals become one.
code() { sed 's|^ *//.*||' "$@" | tr '\n' ' ' | sed -E 's/" +"//g; s/\( +/(/g'; }

# Prints "<heading>: <text>" for each log line, error text and line of the audit log. A call whose
# text is not a literal is printed as it is. The test then fails, because no page has such a line.
# oauth_failure.h is left out, because it only passes texts on.
messages_in_sources() {
  mapfile -t files < <(find src -mindepth 2 -type f ! -name oauth_failure.h)
  { code "${files[@]}" && grep '^#define OAUTH_ENTER' src/oauth_syslog.h; } |
    grep -oE '(OAUTH_(FAIL|DIAG|LOG)\(|[^_]syslog\(|fail\(|OAUTH_REFUSE\(|SetErrMsg\(|errMsg_ = |kErrMsg\] = |auditLog\.Add\()[^";]*("[^"]*"|;)' |
    sed -E '
      s/^OAUTH_FAIL\("(.*)"$/Failures: \1/
      s/^OAUTH_LOG\(LOG_AUTH \| LOG_ERR, "(.*)"$/Refused privileges: \1/
      s/^OAUTH_LOG\(LOG_AUTH \| LOG_INFO, "(.*)"$/Raised privileges: \1/
      s/^OAUTH_DIAG\(kResult, "(.*)"$/Results, bit 1: \1/
      s/^OAUTH_DIAG\(kRow, "(.*)"$/Rows, bit 2: \1/
      s/^OAUTH_DIAG\(kArgument, "(.*)"$/Arguments, bit 4: \1/
      s/^OAUTH_DIAG\(kEntry, "(.*)"$/Entry traces, bit 8: \1/
      s/^OAUTH_REFUSE\(kErr[A-Za-z]+, "(.*)"$/Failures: \1\nError texts: \1/
      s/^fail\(\*this, [A-Za-z]+, "(.*)"$/Error texts: \1/
      s/^(SetErrMsg\(|errMsg_ = |kErrMsg\] = )"(.*)"$/Error texts: \2/
      s/^auditLog\.Add\("(.*)"$/Audit log: \1/' |
    # Leave out the definition, SQLite's own text, and the text of the store.
    grep -vxF -e 'SetErrMsg(const std::string& msg) { errMsg_ = msg;' -e 'fail(*this, code, text);' \
      -e 'kErrMsg] = GetErrMsg();' | LC_ALL=C sort -u
}

# Prints the same lines for the page. A row belongs to the last heading before it, and its text is
# the first one in backticks.
messages_in_page() {
  awk -F '`' '/^#/ { sub(/^#+ /, ""); heading = $0 } /^\| `/ { print heading ": " $2 }' \
    docs/reference/messages.md | LC_ALL=C sort
}

# Prints the statements as SQLite keeps them.
database-format_in_sources() {
  code src/oauth_names.h | grep -oE 'CREATE TABLE IF NOT EXISTS [^;]*' | sed 's/IF NOT EXISTS //' |
    LC_ALL=C sort
}
database-format_in_page() { grep '^CREATE TABLE' docs/reference/database-format.md | LC_ALL=C sort; }

if ! diff --label src --label "docs/reference/$1.md" -U 0 <("$1_in_sources") <("$1_in_page") >&2; then
  echo "reference pages: docs/reference/$1.md and src differ" >&2
  exit 1
fi
echo "reference pages: docs/reference/$1.md has all $("$1_in_page" | wc -l) of src"
