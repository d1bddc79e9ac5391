#include "oauth_log.h"

#include "oauth_names.h"
#include "oauth_syslog.h"
#include "oauth_utils.h"

namespace ZEVOOAUTHSERVER {

OAUTHDBLog::OAUTHDBLog(const std::string& tabName) { SetTabName(tabName); }

int OAUTHDBLog::Add(const std::string& msg) {
  OAUTH_ENTER();
  Json::Value record;
  record[names::column::kMsg] = getSQLFormatStr(msg);
  record[names::column::kTimestamp] = Json::nullValue;
  record[names::column::kId] = Json::nullValue;
  const bool added = DBAdd(record);

  // By timestamp and not by id: all rows that share the second of the first row beyond the ceiling
  // are deleted too. This happens after a failed insert as well.
  const std::string table = GetTabName();
  const std::string trim = "DELETE FROM " + table + " WHERE timestamp IN (SELECT timestamp FROM " +
                           table + " ORDER BY timestamp DESC LIMIT -1 OFFSET " +
                           std::to_string(getTableRowMax(names::setting::kLogMax)) + ")";
  if (!DBCmd(trim, nullptr, nullptr) && isDebugEnabled()) OAUTH_FAIL("Log rotate failed");
  return added;
}

int OAUTHDBLog::Get(const std::string& keyword, const std::string& option, Json::Value* out) {
  OAUTH_ENTER();
  Json::Value request;
  request[names::request::kCondition] = Json::nullValue;
  if (!option.empty()) request[names::request::kOption] = getSQLFormatStr(option);
  if (!keyword.empty())
    request[names::request::kConditionLike] = getSQLFormatLikeStr(names::column::kMsg, keyword);
  return DBGet(request, out);
}

int OAUTHDBLog::Del() {
  OAUTH_ENTER();
  Json::Value request;
  request[names::request::kCondition] = Json::nullValue;
  return DBDel(request);
}

}  // namespace ZEVOOAUTHSERVER
