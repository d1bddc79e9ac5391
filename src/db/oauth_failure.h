// Failures that a store records.

#pragma once

#include <string>

#include "oauth_db_basic.h"
#include "oauth_syslog.h"

namespace ZEVOOAUTHSERVER {

// Records code and text in the store; false, which is the result of the failed operation. For
// failures that other lines of the log explain.
inline bool fail(OAUTHDBBasic& store, int code, const std::string& text) {
  store.SetErrCode(code);
  store.SetErrMsg(text);
  return false;
}

// The same with the text in the log as well. A function whose line names the file and line of the
// caller: the log shows which store refused.
inline bool refuse(OAUTHDBBasic& store, int code, const char* text,
                   const char* file = __builtin_FILE(), int line = __builtin_LINE()) {
  fail(store, code, text);
  OAUTH_LOG_AT(diagnostics::baseName(file), line, LOG_ERR, "%s", text);
  return false;
}

}  // namespace ZEVOOAUTHSERVER
