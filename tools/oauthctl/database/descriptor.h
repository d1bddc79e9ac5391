// An open file, closed with the object.

#pragma once

#include <unistd.h>

#include <utility>

namespace oauthctl {

class Descriptor {
 public:
  explicit Descriptor(int value = -1) : value_(value) {}
  ~Descriptor() {
    if (value_ >= 0) close(value_);
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

}  // namespace oauthctl
