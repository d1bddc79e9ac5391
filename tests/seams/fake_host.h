// The host's libraries. Linking this seam replaces their functions in the whole program.
//
// The cipher reverses the text and puts "sealed:" before it: "abc" <-> "sealed:cba". Text without
// that beginning cannot be decrypted.

#pragma once

#include <string>
#include <vector>

class FakeHost {
 public:
  FakeHost();
  ~FakeHost();
  FakeHost(const FakeHost&) = delete;
  FakeHost& operator=(const FakeHost&) = delete;

  // The n-th call from now on fails, 1 being the next; those before and after it succeed.
  void failEncrypt(int nth);
  void failDecrypt(int nth);
  // Fill the whole buffer with 'x' and leave no NUL byte.
  void overfill();
  // Every call: "encrypt abc 1024", "decrypt sealed:cba 1024", "ip 1024".
  const std::vector<std::string>& calls() const;

  // Begins a web request of this client. At first there is no request.
  void setRemoteIp(const std::string& address);
  // The same, but the function returns this code; only 0 is a success.
  void setRemoteIp(const std::string& address, int code);

  static std::string sealed(const std::string& plain);
};
