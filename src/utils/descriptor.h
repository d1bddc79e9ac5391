// A file descriptor that closes itself.

#pragma once

#include <unistd.h>

#include <utility>

namespace ZEVOOAUTHSERVER {

class Descriptor {
 public:
  // Owns the value; a negative one means that nothing is open.
  explicit Descriptor(int value = -1) : value_(value) {}
  ~Descriptor() {
    if (isOpen()) close(value_);
  }
  Descriptor(Descriptor&& other) noexcept : value_(std::exchange(other.value_, -1)) {}
  Descriptor& operator=(Descriptor&& other) noexcept {
    std::swap(value_, other.value_);
    return *this;
  }

  bool isOpen() const { return value_ >= 0; }
  int value() const { return value_; }

 private:
  int value_;
};

}  // namespace ZEVOOAUTHSERVER
