// Hostile values for the store of authorization codes.

#include <cstddef>
#include <cstdint>
#include <vector>

#include "oauth_grantCode.h"
#include "require.h"
#include "store_world.h"

namespace {

constexpr char kTable[] = "oauth_grantCode";

class GrantCodeFuzz {
 public:
  explicit GrantCodeFuzz(FuzzedDataProvider& input) : input_(input), world_(input) {}

  void step() {
    switch (input_.ConsumeIntegralInRange(0, 13)) {
      case 0:
        return issue();
      case 1:
        return del();
      case 2:
        return revoke();
      case 3:
        return purge();
      case 4:
        return world_.moveClock();
      case 5:
        return world_.getById(codes_, kTable);
      case 6:
        return world_.getAll(codes_, kTable);
      case 7:
        return editShort();
      case 8:
        return editLong();
      case 9:
      case 10:
        return get();
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
          state(textOf(input, 1, 2048)) {}
    bool good() const {
      return fits(user, 1, 256) && fits(client, 64, 64) && fits(scope, 1, 2048) &&
             fits(state, 1, 2048);
    }
    Row values() const {
      return {{"username", user}, {"client_id", client}, {"scope", scope}, {"state", state}};
    }
    const std::string user, client, scope, state;
  };

  std::string code() { return textOrKnown(input_, 64, 64, known_); }

  // Does to the model what Add() does to the table. Returns what Add() must return.
  int added(const Grant& grant, const std::string& code, const std::string& expiry,
            const std::string& ip, Json::Value& result) {
    if (world_.rows(kTable).size() >= StoreWorld::kRowMax)
      return world_.fail(-5, "GrantCode Table is full");
    if (!ip.empty() && !isAddress(ip)) return 0;
    if (!grant.good() || !fits(code, 64, 64) || !fits(expiry, 1, 128)) return 0;
    result["code"] = code;
    Row quoted = grant.values();
    quoted["code"] = code;
    return world_.insert(kTable, "code", {quoted, {{"expired_time", expiry}, {"ip", ip}}});
  }

  void add() {
    const Grant grant(input_);
    const std::string code = this->code();
    const std::string expiry = expiryOf(input_);
    const std::string ip = addressOf(input_);
    known_.push_back(code);
    Json::Value result, expected;
    result["other"] = expected["other"] = "kept";
    const int success =
        codes_.Add(grant.user, grant.client, grant.scope, code, expiry, grant.state, ip, result);
    world_.expect(codes_, success, added(grant, code, expiry, ip, expected));
    StoreWorld::requireEqual(result, expected);
  }
  void issue() {
    const Grant grant(input_);
    const std::string ip = addressOf(input_);
    Json::Value result;
    const int success = codes_.Add(grant.user, grant.client, grant.scope, grant.state, ip, result);
    // The secrets are random, so take them from the result.
    const std::string code = success != 0 ? result["code"].asString() : std::string(64, 'x');
    const std::string expiry = std::to_string(world_.now() + StoreWorld::kPeriod);
    Json::Value expected;
    world_.expect(codes_, success, added(grant, code, expiry, ip, expected));
    if (success != 0) known_.push_back(code);
  }

  // The short form stores values as they are.
  void editShort() {
    const std::int64_t id = world_.anyId(kTable);
    const Grant grant(input_);
    const int success = codes_.Edit(id, grant.user, grant.client, grant.scope, grant.state);
    if (!grant.good()) return world_.expect(codes_, success, 0);
    world_.expect(codes_, success, world_.update(kTable, id, {{}, grant.values()}));
  }
  void editLong() {
    const std::int64_t id = world_.anyId(kTable);
    const Grant grant(input_);
    const std::string expiry = expiryOf(input_);
    const int success = codes_.Edit(id, grant.user, grant.client, grant.scope, expiry, grant.state);
    if (!grant.good() || !fits(expiry, 1, 128)) return world_.expect(codes_, success, 0);
    world_.expect(codes_, success,
                  world_.update(kTable, id, {grant.values(), {{"expired_time", expiry}}}));
  }

  void del() {
    const std::int64_t id = world_.anyId(kTable);
    world_.expect(codes_, codes_.Del(id), world_.rows(kTable).erase(id) > 0);
  }
  void revoke() {
    const std::int64_t id = world_.anyId(kTable);
    const int success = codes_.Revoke(id);
    const Row written = {{"expired_time", std::to_string(world_.now())}};
    world_.expect(codes_, success, world_.update(kTable, id, {{}, written}));
  }
  void purge() {
    const int success = codes_.Purge();
    world_.dropExpired(kTable);
    world_.expect(codes_, success, 1);
  }

  // The code is looked up as it is, though it is stored with its quotes doubled.
  void get() {
    const std::string code = this->code();
    Json::Value rows;
    const int success = codes_.Get(code, &rows);
    const int index = codes_.GetIndex(code);
    const std::int64_t found =
        world_.expectFound(codes_, kTable, rows, success, "code", code, true);
    require(index == static_cast<int>(found), "the row id is the one of the row");
  }

  FuzzedDataProvider& input_;
  StoreWorld world_;
  ZEVOOAUTHSERVER::OAUTHDBGrantCode codes_{kTable};
  std::vector<std::string> known_{std::string(64, 'd')};
};

}  // namespace

extern "C" int LLVMFuzzerTestOneInput(const std::uint8_t* data, std::size_t size) {
  return run<GrantCodeFuzz>(data, size);
}
