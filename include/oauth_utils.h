/// \file
/// Free functions for the stores and their callers: settings, the diagnostic switch, input checks,
/// SQL quoting, the web client's address, random secrets.
///
/// You may call them from any thread, and with or without the namespace.

#pragma once

#include <string>

#pragma GCC visibility push(default)
namespace ZEVOOAUTHSERVER {

/// Whether diagnostics go to the system log: true if the marker file "/tmp/zevooauth_debug" was
/// readable when this thread asked first. The thread keeps this answer as long as it lives.
bool isDebugEnabled();

/// Mask of diagnostic classes, from the setting "log_level": 1 results, 2 rows, 4 arguments,
/// 8 entry traces. Each thread reads it once. 0 if it is not set.
int getLogLevel();

/// Lifetime in seconds from the setting named by key, such as "token_expired"; 600 unless the
/// settings file holds an integer above 0. Every call reads the file again.
int getExpiredPeriod(const std::string& key);

/// Row ceiling from the setting named by key, such as "token_max": 1000 unless set to 1 or more,
/// 10000 at most. Every call reads the file again.
int getTableRowMax(const std::string& key);

/// Whether the string is minLen to maxLen bytes long, both inclusive. With allowEmpty the empty
/// string is always accepted.
bool checkStrLen(const std::string& str, int minLen, int maxLen, bool allowEmpty);

/// Address of the client of the current web request, as the host gives it, not validated. Empty
/// outside a request.
std::string getRemoteIP();

/// Returns the value with every single quote doubled, for use between single quotes in SQL. The
/// result ends at the value's first NUL byte, so refuse values that hold one. It is empty if memory
/// runs out (log only).
std::string getSQLFormatStr(const std::string& value);

/// Returns the SQL condition that a column contains a value. The value is quoted as above.
///
///     <column> like '%<value>%'
///
/// Percent sign and underscore in the value keep their meaning as wildcards. column is inserted as
/// it is and must never come from a user. The result is empty if memory runs out (log only).
std::string getSQLFormatLikeStr(const std::string& column, const std::string& value);

/// Returns random lower-case hexadecimal digits for secrets: version-4 UUIDs (RFC 4122) without
/// hyphens. The random bytes come from getrandom(), or from "/dev/urandom" if the kernel lacks or
/// refuses that call. The length is rounded up to a multiple of 32: 40 gives 64 digits, 0 gives
/// none. The result is empty if both sources fail. The stores then refuse it as too short.
std::string getRandomStr(unsigned int length);

}  // namespace ZEVOOAUTHSERVER
#pragma GCC visibility pop

// Programs may call these functions with the namespace or without it.
using ZEVOOAUTHSERVER::checkStrLen;
using ZEVOOAUTHSERVER::getExpiredPeriod;
using ZEVOOAUTHSERVER::getLogLevel;
using ZEVOOAUTHSERVER::getRandomStr;
using ZEVOOAUTHSERVER::getRemoteIP;
using ZEVOOAUTHSERVER::getSQLFormatLikeStr;
using ZEVOOAUTHSERVER::getSQLFormatStr;
using ZEVOOAUTHSERVER::getTableRowMax;
using ZEVOOAUTHSERVER::isDebugEnabled;
