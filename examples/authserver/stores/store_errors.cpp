#include "store_errors.h"

#include <iostream>
#include <stdexcept>

namespace authserver {
namespace {

// SQLite's error codes while another connection holds a lock.
constexpr int kBusy = 5, kLocked = 6;

}  // namespace

void requireOpen(const ZEVOOAUTHSERVER::OAUTHDBBasic& store) {
  if (store.GetErrCode() == ZEVOOAUTHSERVER::kErrNone) return;
  // One write: other programs write to the same log.
  std::cerr << "authserver: the database did not open [" + std::to_string(store.GetErrCode()) +
                   "] " + store.GetErrMsg() + '\n';
  throw temporarilyUnavailable();
}

bool isMissingRow(const ZEVOOAUTHSERVER::OAUTHDBBasic& store) {
  switch (store.GetErrCode()) {
    case ZEVOOAUTHSERVER::kErrNone:
    case ZEVOOAUTHSERVER::kErrBadParameters:  // a value of a length that no row can have
      return true;
    case ZEVOOAUTHSERVER::kErrTableFull:
      throw TableFull();
    case kBusy:
    case kLocked:
      throw temporarilyUnavailable();
    default:
      throw std::runtime_error("database [" + std::to_string(store.GetErrCode()) + "] " +
                               store.GetErrMsg());
  }
}

}  // namespace authserver
