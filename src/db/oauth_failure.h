// Failures that a store records.

#pragma once

#include "oauth_db_basic.h"
#include "oauth_syslog.h"

namespace ZEVOOAUTHSERVER {

// Records code and text in the store. Returns false, which is the result of the operation that
// failed. For failures that have another log line, or none.
inline bool fail(OAUTHDBBasic& store, int code, const char* text) {
  store.SetErrCode(code);
  store.SetErrMsg(text);
  return false;
}

}  // namespace ZEVOOAUTHSERVER

// In a member function of a store: the same, and the text in the log as well. A macro, because the
// text is the format of the log line, and the line names the file that refuses.
#define OAUTH_REFUSE(code, text)                                                              \
  (::ZEVOOAUTHSERVER::fail(*this, (code), text),                                              \
   OAUTH_LOG_AT(::ZEVOOAUTHSERVER::diagnostics::baseName(__FILE__), __LINE__, LOG_ERR, text), \
   false)
