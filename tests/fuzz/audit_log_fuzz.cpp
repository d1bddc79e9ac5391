// Hostile messages and keywords for the audit log. Options are SQL, so they do not come from the
// input.

#include <cstddef>
#include <cstdint>

#include "oauth_log.h"
#include "store_world.h"

namespace {

constexpr char kTable[] = "oauth_log";

class AuditLogFuzz {
 public:
  explicit AuditLogFuzz(FuzzedDataProvider& input) : input_(input), world_(input) {}

  void step() {
    switch (input_.ConsumeIntegralInRange(0, 7)) {
      case 0:
        return del();
      case 1:
        return world_.moveClock();
      case 2:
      case 3:
      case 4:
        return get();
      default:
        return add();
    }
  }

 private:
  void add() {
    const std::string msg = input_.ConsumeRandomLengthString();
    const int result = log_.Add(msg);
    world_.addToLog(msg);
    world_.expect(log_, result, 1);
  }
  void get() {
    const std::string keyword = input_.ConsumeRandomLengthString();
    const std::string option = input_.PickValueInArray(
        {"", "ORDER BY id DESC", "LIMIT 1", "ORDER BY timestamp, id LIMIT 2 OFFSET 1"});
    Json::Value lines;
    world_.expect(log_, log_.Get(keyword, option, &lines), 1);
    StoreWorld::requireEqual(lines, StoreWorld::linesLike("%" + untilNul(keyword) + "%", option));
  }
  void del() {
    const bool any = !world_.rows(kTable).empty();
    world_.rows(kTable).clear();
    world_.expect(log_, log_.Del(), any);
  }

  FuzzedDataProvider& input_;
  StoreWorld world_;
  ZEVOOAUTHSERVER::OAUTHDBLog log_{kTable};
};

}  // namespace

extern "C" int LLVMFuzzerTestOneInput(const std::uint8_t* data, std::size_t size) {
  return run<AuditLogFuzz>(data, size);
}
