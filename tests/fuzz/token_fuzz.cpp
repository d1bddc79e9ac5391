// Hostile values for the store of tokens.

#include <cstddef>
#include <cstdint>
#include <vector>

#include "oauth_token.h"
#include "require.h"
#include "store_world.h"

namespace {

constexpr char kTable[] = "oauth_token";

class TokenFuzz {
 public:
  explicit TokenFuzz(FuzzedDataProvider& input) : input_(input), world_(input) {}

  void step() {
    switch (input_.ConsumeIntegralInRange(0, 15)) {
      case 0:
        return issue();
      case 1:
        return del();
      case 2:
        return purge();
      case 3:
        return world_.moveClock();
      case 4:
        return world_.getById(tokens_, kTable);
      case 5:
        return world_.getAll(tokens_, kTable);
      case 6:
        return editShort();
      case 7:
        return editLong();
      case 8:
        return getWithAccessToken();
      case 9:
        return getWithRefreshToken();
      case 10:
      case 11:
        return verify();
      default:
        return add();
    }
  }

 private:
  // The arguments that Add() and Edit() share.
  struct Grant {
    explicit Grant(FuzzedDataProvider& input)
        : user(textOf(input, 1, 256)),
          client(textOf(input, 64, 64)),
          scope(textOf(input, 1, 2048)),
          flow(textOf(input, 1, 32)),
          state(textOf(input, 1, 2048)) {}
    bool good() const {
      return fits(user, 1, 256) && fits(client, 64, 64) && fits(scope, 1, 2048) &&
             fits(flow, 1, 32) && fits(state, 1, 2048);
    }
    Row values() const {
      return {{"username", user},
              {"client_id", client},
              {"scope", scope},
              {"flow_type", flow},
              {"state", state}};
    }
    const std::string user, client, scope, flow, state;
  };

  std::string token() { return textOrKnown(input_, 64, 64, known_); }

  // Does to the model what Add() does to the table. Returns what Add() must return.
  int added(const Grant& grant, const std::string& refresh, const std::string& access,
            const std::string& expiry, const std::string& ip, Json::Value& result) {
    if (world_.rows(kTable).size() >= StoreWorld::kRowMax)
      return world_.fail(-5, "Token Table is full");
    if (!ip.empty() && !isAddress(ip)) return 0;
    if (!grant.good() || !fits(refresh, 64, 64) || !fits(access, 64, 64) || !fits(expiry, 1, 128))
      return world_.fail(-2, "Bad parameters");
    result["refresh_token"] = refresh;
    result["access_token"] = access;
    Row quoted = grant.values();
    quoted.insert({{"refresh_token", refresh},
                   {"access_token", access},
                   {"expired_time", expiry},
                   {"ip", ip}});
    return world_.insert(kTable, "access_token", {quoted, {}});
  }

  void add() {
    const Grant grant(input_);
    const std::string refresh = token();
    const std::string access = token();
    const std::string expiry = expiryOf(input_);
    const std::string ip = addressOf(input_);
    known_.push_back(refresh);
    known_.push_back(access);
    Json::Value result, expected;
    result["other"] = expected["other"] = "kept";
    const int success = tokens_.Add(grant.user, grant.client, grant.scope, refresh, access, expiry,
                                    grant.flow, grant.state, ip, result);
    world_.expect(tokens_, success, added(grant, refresh, access, expiry, ip, expected));
    StoreWorld::requireEqual(result, expected);
  }
  void issue() {
    const Grant grant(input_);
    const std::string ip = addressOf(input_);
    Json::Value result;
    const int success =
        tokens_.Add(grant.user, grant.client, grant.scope, grant.flow, grant.state, ip, result);
    // The secrets are random, so take them from the result.
    const std::string unknown(64, 'x');
    const std::string refresh = success != 0 ? result["refresh_token"].asString() : unknown;
    const std::string access = success != 0 ? result["access_token"].asString() : unknown;
    const std::string expiry = std::to_string(world_.now() + StoreWorld::kPeriod);
    Json::Value expected;
    world_.expect(tokens_, success, added(grant, refresh, access, expiry, ip, expected));
    if (success != 0) known_.insert(known_.end(), {refresh, access});
  }

  // The short form stores values as they are.
  void editShort() {
    const std::int64_t id = world_.anyId(kTable);
    const Grant grant(input_);
    const int success =
        tokens_.Edit(id, grant.user, grant.client, grant.scope, grant.flow, grant.state);
    if (!grant.good()) return world_.expect(tokens_, success, world_.fail(-2, "Bad parameters"));
    world_.expect(tokens_, success, world_.update(kTable, id, {{}, grant.values()}));
  }
  void editLong() {
    const std::int64_t id = world_.anyId(kTable);
    const Grant grant(input_);
    const std::string expiry = expiryOf(input_);
    const int success =
        tokens_.Edit(id, grant.user, grant.client, grant.scope, expiry, grant.flow, grant.state);
    if (!grant.good() || !fits(expiry, 1, 128))
      return world_.expect(tokens_, success, world_.fail(-2, "Bad parameters"));
    world_.expect(tokens_, success,
                  world_.update(kTable, id, {grant.values(), {{"expired_time", expiry}}}));
  }

  void del() {
    const std::int64_t id = world_.anyId(kTable);
    const int success = input_.ConsumeBool() ? tokens_.Del(id) : tokens_.Revoke(id);
    world_.expect(tokens_, success, world_.rows(kTable).erase(id) > 0);
  }
  void purge() {
    const int success = tokens_.Purge();
    world_.dropExpired(kTable);
    world_.expect(tokens_, success, 1);
  }

  void getWithAccessToken() {
    const std::string access = token();
    Json::Value rows;
    const int success = tokens_.GetWithAccessToken(access, &rows);
    const int index = tokens_.GetIndex(access);
    const std::int64_t found =
        world_.expectFound(tokens_, kTable, rows, success, "access_token", access);
    require(index == static_cast<int>(found), "the row id is the one of the row");
  }
  void getWithRefreshToken() {
    const std::string refresh = token();
    Json::Value rows;
    const int success = tokens_.GetWithRefreshToken(refresh, &rows);
    world_.expectFound(tokens_, kTable, rows, success, "refresh_token", refresh);
  }
  void verify() {
    const std::string access = token();
    Json::Value result;
    const int success = tokens_.Verify(access, result);
    if (!fits(access, 64, 64)) {
      world_.expect(tokens_, success, world_.fail(-2, "Bad parameters"));
      return expectRefusal(result, -2, "Bad parameters");
    }
    for (const auto& [id, row] : world_.rows(kTable)) {
      if (row.at("access_token") != doubled(access)) continue;
      if (world_.now() > number(row.at("expired_time"))) break;
      world_.expect(tokens_, success, 1);
      Json::Value expected;
      for (const char* const column : {"username", "scope", "state"})
        expected[column] = row.at(column);
      return StoreWorld::requireEqual(result, expected);
    }
    world_.expect(tokens_, success, 0);
    expectRefusal(result, -3, "Access Token Expired");
  }
  static void expectRefusal(const Json::Value& result, int code, const char* msg) {
    Json::Value expected;
    expected["err_code"] = code;
    expected["err_msg"] = msg;
    StoreWorld::requireEqual(result, expected);
  }

  FuzzedDataProvider& input_;
  StoreWorld world_;
  ZEVOOAUTHSERVER::OAUTHDBToken tokens_{kTable};
  std::vector<std::string> known_{std::string(64, 't'), std::string(64, 'r')};
};

}  // namespace

extern "C" int LLVMFuzzerTestOneInput(const std::uint8_t* data, std::size_t size) {
  return run<TokenFuzz>(data, size);
}
