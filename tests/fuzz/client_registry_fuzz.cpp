// Hostile values for the client registry.

#include <cstddef>
#include <cstdint>
#include <vector>

#include "oauth_clientInfo.h"
#include "require.h"
#include "store_world.h"

namespace {

constexpr char kTable[] = "oauth_clientInfo";

std::string withoutScheme(const std::string& uri) {
  for (const std::string scheme : {"https://", "http://"})
    if (uri.substr(0, scheme.size()) == scheme) return uri.substr(scheme.size());
  return uri;
}

bool isSecret(const std::string& text) {
  return text.size() == 64 && text.find_first_not_of("0123456789abcdef") == std::string::npos;
}

class ClientRegistryFuzz {
 public:
  explicit ClientRegistryFuzz(FuzzedDataProvider& input) : input_(input), world_(input) {}

  void step() {
    switch (input_.ConsumeIntegralInRange(0, 11)) {
      case 0:
        return generate();
      case 1:
        return generateId();
      case 2:
        return enable();
      case 3:
        return del();
      case 4:
        return world_.moveClock();
      case 5:
        return world_.getById(clients_, kTable);
      case 6:
        return world_.getAll(clients_, kTable);
      case 7:
        return edit();
      case 8:
        return get();
      default:
        return add();
    }
  }

 private:
  std::string identifier() { return textOrKnown(input_, 64, 64, known_); }
  std::string uri() {
    const std::string scheme =
        input_.PickValueInArray({"", "https://", "http://", "HTTPS://", "https://http://"});
    return scheme + textOf(input_, 3, 2048);
  }
  std::string scope() { return textOf(input_, 1, 2048); }
  std::string name() { return textOf(input_, 1, 64); }

  // Does to the model what Add() does to the table. Returns what Add() must return.
  int added(const std::string& id, const std::string& secret, const std::string& uri,
            const std::string& scope, const std::string& name, const std::string& enable,
            Json::Value& result) {
    if (world_.rows(kTable).size() >= StoreWorld::kRowMax)
      return world_.fail(-5, "ClientInfo Table is full");
    const std::string stripped = withoutScheme(uri);
    if (!fits(id, 64, 64) || !fits(secret, 64, 64) || !fits(stripped, 3, 2048) ||
        !fits(scope, 1, 2048) || !fits(name, 1, 64) || (enable != "1" && enable != "0"))
      return world_.fail(-2, "Bad parameters");
    result["client_id"] = id;
    result["client_secret"] = secret;
    const int success = world_.insert(kTable, "client_id",
                                      {{{"enable", enable},
                                        {"client_id", id},
                                        {"client_secret", secret},
                                        {"redirect_uri", stripped},
                                        {"scope", scope},
                                        {"display_name", name}},
                                       {}});
    if (success != 0) world_.addToLog("Application registed[" + name + "]");
    return success;
  }

  void add() {
    const std::string id = identifier();
    const std::string secret = textOf(input_, 64, 64);
    const std::string where = uri();
    const std::string what = scope();
    const std::string who = name();
    const std::string enable = input_.PickValueInArray({"1", "0", "1", "0", "", "true", "1'"});
    known_.push_back(id);
    Json::Value result, expected;
    result["other"] = expected["other"] = "kept";
    const int success = clients_.Add(id, secret, where, what, who, enable, result);
    world_.expect(clients_, success, added(id, secret, where, what, who, enable, expected));
    StoreWorld::requireEqual(result, expected);
  }
  void generate() {
    const std::string where = uri();
    const std::string what = scope();
    const std::string who = name();
    Json::Value result;
    const int success = clients_.Add(where, what, who, result);
    expectGenerated(success, where, what, who, result);
  }
  void generateId() {
    const std::string secret = textOf(input_, 64, 64);
    const std::string where = uri();
    const std::string what = scope();
    const std::string who = name();
    Json::Value result;
    const int success = clients_.Add(secret, where, what, who, result);
    if (success != 0)
      require(result["client_secret"].asString() == secret, "the secret is the caller's");
    if (!fits(secret, 64, 64) && world_.rows(kTable).size() < StoreWorld::kRowMax)
      return world_.expect(clients_, success, world_.fail(-2, "Bad parameters"));
    expectGenerated(success, where, what, who, result);
  }
  // The generated values are random, so take them from the result.
  void expectGenerated(int success, const std::string& where, const std::string& what,
                       const std::string& who, const Json::Value& result) {
    const std::string id = success != 0 ? result["client_id"].asString() : std::string(64, 'x');
    const std::string secret =
        success != 0 ? result["client_secret"].asString() : std::string(64, 'x');
    if (success != 0) require(isSecret(id), "a generated identifier is 64 digits");
    Json::Value expected;
    world_.expect(clients_, success, added(id, secret, where, what, who, "1", expected));
    if (success != 0) known_.push_back(id);
  }

  void edit() {
    const std::int64_t id = world_.anyId(kTable);
    const std::string where = uri();
    const std::string what = scope();
    const std::string who = name();
    const int success = clients_.Edit(id, where, what, who);
    if (!fits(where, 3, 2048) || !fits(what, 1, 2048) || !fits(who, 1, 64))
      return world_.expect(clients_, success, world_.fail(-2, "Bad parameters"));
    const Row written = {{"redirect_uri", where}, {"scope", what}, {"display_name", who}};
    world_.expect(clients_, success, world_.update(kTable, id, {written, {}}));
  }
  void enable() {
    const std::int64_t id = world_.anyId(kTable);
    const bool on = input_.ConsumeBool();
    const int success = on ? clients_.Enable(id) : clients_.Disable(id);
    world_.expect(clients_, success, world_.update(kTable, id, {{{"enable", on ? "1" : "0"}}, {}}));
  }
  void del() {
    const std::int64_t id = world_.anyId(kTable);
    world_.expect(clients_, clients_.Del(id), world_.rows(kTable).erase(id) > 0);
  }

  void get() {
    const std::string id = identifier();
    Json::Value rows;
    const int success = clients_.Get(id, &rows);
    const int index = clients_.GetIndex(id);
    const std::int64_t found = world_.expectFound(clients_, kTable, rows, success, "client_id", id);
    require(index == static_cast<int>(found), "the row id is the one of the row");
  }

  FuzzedDataProvider& input_;
  StoreWorld world_;
  ZEVOOAUTHSERVER::OAUTHDBClientInfo clients_{kTable};
  std::vector<std::string> known_{std::string(64, 'c')};
};

}  // namespace

extern "C" int LLVMFuzzerTestOneInput(const std::uint8_t* data, std::size_t size) {
  return run<ClientRegistryFuzz>(data, size);
}
