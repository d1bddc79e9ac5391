/// \file
/// Free functions shared by the stores, and of use to their callers: settings, the diagnostic
/// switch, input checks, SQL quoting, the web client's address, random secrets.
///
/// All of them may be called from any thread, with or without the namespace.

#pragma once

#include <string>

#pragma GCC visibility push(default)
namespace ZEVOOAUTHSERVER {

/// Whether diagnostics go to the system log: the marker file "/tmp/zevooauth_debug" was readable
/// when this thread asked first. Decided once per thread and kept for the thread's life.
bool isDebugEnabled();

/// Mask of diagnostic classes, from the setting "log_level": 1 results, 2 rows, 4 arguments,
/// 8 entry traces. Read once per thread; 0 when it is not set.
int getLogLevel();

/// Lifetime in seconds from the setting named by key ("grantcode_expired" or "token_expired");
/// 600 unless the settings file holds an integer above 0. Read afresh on every call.
int getExpiredPeriod(const std::string& key);

/// Row ceiling from the setting named by key ("client_info_max", "grantcode_max", "token_max" or
/// "log_max"): 1000 unless set to 1 or more, 10000 at most. Read afresh on every call.
int getTableRowMax(const std::string& key);

/// Whether the string is minLen to maxLen bytes long, both inclusive. allowEmpty admits the empty
/// string whatever minLen says.
bool checkStrLen(const std::string& str, int minLen, int maxLen, bool allowEmpty);

/// Address of the client of the current web request, as the host tells it and not validated;
/// empty outside a request.
std::string getRemoteIP();

/// The value with every single quote doubled, for use between single quotes in SQL. It ends at the
/// value's first NUL byte, so refuse values that hold one. Empty when memory runs out (log only).
std::string getSQLFormatStr(const std::string& value);

/// The SQL condition that a column contains a value, the value quoted as above.
///
///     <column> like '%<value>%'
///
/// Percent sign and underscore in the value keep their meaning as wildcards; column is inserted as
/// it is and must never come from a user. Empty when memory runs out (log only).
std::string getSQLFormatLikeStr(const std::string& column, const std::string& value);

/// Random lower-case hexadecimal digits for secrets: version-4 UUIDs (RFC 4122) without hyphens,
/// from the operating system: getrandom(), or "/dev/urandom" where the kernel lacks or refuses that
/// call. The length is rounded up to a multiple of 32: 40 gives 64 digits, 0 gives none. Empty if
/// both sources fail, which the stores then refuse as too short: a guessable secret would be worse.
std::string getRandomStr(unsigned int length);

}  // namespace ZEVOOAUTHSERVER
#pragma GCC visibility pop

// Either spelling compiles, with the namespace and without.
using ZEVOOAUTHSERVER::checkStrLen;
using ZEVOOAUTHSERVER::getExpiredPeriod;
using ZEVOOAUTHSERVER::getLogLevel;
using ZEVOOAUTHSERVER::getRandomStr;
using ZEVOOAUTHSERVER::getRemoteIP;
using ZEVOOAUTHSERVER::getSQLFormatLikeStr;
using ZEVOOAUTHSERVER::getSQLFormatStr;
using ZEVOOAUTHSERVER::getTableRowMax;
using ZEVOOAUTHSERVER::isDebugEnabled;
