#include "fake_host.h"

#include <algorithm>
#include <cstring>
#include <mutex>
#include <optional>

#include "host_libraries.h"
#include "own_work.h"

namespace {

constexpr char kMark[] = "sealed:";

struct State {
  int encryptCountdown = 0, decryptCountdown = 0;  // fails on reaching 0
  bool overfill = false;
  std::optional<std::string> remoteIp;
  int remoteIpCode = 0;
  std::vector<std::string> calls;
};
std::mutex guard;
State state;

bool fails(int& countdown) { return countdown > 0 && --countdown == 0; }

bool put(const std::string& text, char* out, int outSize) {
  const auto size = static_cast<std::size_t>(outSize);
  if (state.overfill) {
    std::memset(out, 'x', size);
    return true;
  }
  if (text.size() >= size) return false;
  std::memcpy(out, text.c_str(), text.size() + 1);
  return true;
}

void note(const std::string& call, int outSize) {
  state.calls.push_back(call + " " + std::to_string(outSize));
}

}  // namespace

FakeHost::FakeHost() {
  const std::lock_guard<std::mutex> lock(guard);
  state = State();
}
FakeHost::~FakeHost() {
  const std::lock_guard<std::mutex> lock(guard);
  state = State();
}
void FakeHost::failEncrypt(int nth) { state.encryptCountdown = nth; }
void FakeHost::failDecrypt(int nth) { state.decryptCountdown = nth; }
void FakeHost::overfill() { state.overfill = true; }
const std::vector<std::string>& FakeHost::calls() const { return state.calls; }
void FakeHost::setRemoteIp(const std::string& address) { setRemoteIp(address, 0); }
void FakeHost::setRemoteIp(const std::string& address, int code) {
  state.remoteIp = address;
  state.remoteIpCode = code;
}

std::string FakeHost::sealed(const std::string& plain) {
  return kMark + std::string(plain.rbegin(), plain.rend());
}

extern "C" int ZOCLCryptSzEncrypt(const char* plain, char* out, int outSize) {
  const OwnWork seam;
  const std::lock_guard<std::mutex> lock(guard);
  note("encrypt " + std::string(plain), outSize);
  if (fails(state.encryptCountdown)) return 0;
  return put(FakeHost::sealed(plain), out, outSize) ? 1 : 0;
}

extern "C" int ZOCLCryptSzDecrypt(const char* cipher, char* out, int outSize) {
  const OwnWork seam;
  const std::lock_guard<std::mutex> lock(guard);
  note("decrypt " + std::string(cipher), outSize);
  const std::string text = cipher;
  if (fails(state.decryptCountdown) || text.rfind(kMark, 0) != 0) return 0;
  const std::string body = text.substr(std::strlen(kMark));
  return put(std::string(body.rbegin(), body.rend()), out, outSize) ? 1 : 0;
}

extern "C" int ZevoCgiGetRemoteIP(char* out, int outSize) {
  const OwnWork seam;
  const std::lock_guard<std::mutex> lock(guard);
  note("ip", outSize);
  if (!state.remoteIp && !state.overfill) return -1;
  return put(state.remoteIp.value_or(""), out, outSize) ? state.remoteIpCode : -1;
}
