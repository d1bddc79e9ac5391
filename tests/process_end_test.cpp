// Stores can be used until the end of a process: in exit handlers, and in destructors of global
// objects.

#include <cstdio>
#include <cstdlib>

#include "oauth_clientInfo.h"
#include "oauth_grantCode.h"
#include "oauth_log.h"
#include "oauth_token.h"
#include "store_test.h"

using namespace ZEVOOAUTHSERVER;

namespace {

// Writes, reads and deletes one row of every table.
int useEveryStore() {
  int done = 0;
  Json::Value result, rows;
  OAUTHDBClientInfo clients("oauth_clientInfo");
  done += clients.Add("https://a.example/cb", "read", "Mail", result) && clients.Get(&rows);
  done += clients.Del(clients.GetIndex(result["client_id"].asString()));
  OAUTHDBGrantCode codes("oauth_grantCode");
  done += codes.Add("alice", times(64), "read", "xyz", "192.0.2.7", result) && codes.Get(&rows);
  done += codes.Add("alice", times(64), "read", "xyz", "no address", result) == 0;
  done += codes.Del(codes.GetIndex(result["code"].asString()));
  OAUTHDBToken tokens("oauth_token");
  done += tokens.Add("alice", times(64), "read", "code", "xyz", "::1", result) &&
          tokens.Verify(result["access_token"].asString(), rows[0U]);
  done += tokens.Del(tokens.GetIndex(result["access_token"].asString())) && tokens.Purge();
  OAUTHDBLog log("oauth_log");
  done += log.Get("Mail", "ORDER BY id", &rows) && !rows.empty();
  return done;
}
constexpr int kAll = 8;

void useStoresAtExit() {
  const int done = useEveryStore();
  std::fprintf(stderr, "%d of %d done\n", done, kAll);
  if (done != kAll) std::_Exit(1);
}

class ProcessEndTest : public StoreTest {};

TEST_F(ProcessEndTest, StoresWorkInAnExitHandler) {
  EXPECT_EXIT(
      {
        std::atexit(useStoresAtExit);  // runs after what is made from here on is destroyed
        useEveryStore();
        std::exit(0);
      },
      testing::ExitedWithCode(0), "8 of 8 done");
}

TEST_F(ProcessEndTest, StoresWorkInADestructorOfAGlobalObject) {
  EXPECT_EXIT(
      {
        static const struct Last {
          ~Last() { useStoresAtExit(); }
        } last;
        useEveryStore();
        std::exit(0);
      },
      testing::ExitedWithCode(0), "8 of 8 done");
}

}  // namespace
