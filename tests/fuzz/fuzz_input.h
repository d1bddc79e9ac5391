// Arguments from the fuzzer's bytes. Texts come from the front of the input, each ended by a
// backslash and one more byte. Choices and numbers come from its end, backwards.

#pragma once

#include <fuzzer/FuzzedDataProvider.h>

#include <cstdint>
#include <string>
#include <vector>

// A text of min to max bytes in most cases; else one byte too short or too long, or of any length.
inline std::string textOf(FuzzedDataProvider& input, int min, int max) {
  std::string text = input.ConsumeRandomLengthString(static_cast<std::size_t>(max) + 1);
  const auto fill = input.ConsumeIntegral<char>();
  switch (input.ConsumeIntegralInRange(0, 15)) {
    case 1:
      text.resize(static_cast<std::size_t>(min) - 1, fill);
      return text;
    case 2:
      text.resize(static_cast<std::size_t>(max) + 1, fill);
      return text;
    case 3:
      text.resize(static_cast<std::size_t>(max), fill);
      return text;
    case 4:
      return text;
    default:
      if (text.size() < static_cast<std::size_t>(min))
        text.resize(static_cast<std::size_t>(min), fill);
      if (text.size() > static_cast<std::size_t>(max)) text.pop_back();
      return text;
  }
}

// One of those given, or a new one.
inline std::string textOrKnown(FuzzedDataProvider& input, int min, int max,
                               const std::vector<std::string>& known) {
  const auto choice = input.ConsumeIntegralInRange<std::size_t>(0, known.size());
  return choice < known.size() ? known[choice] : textOf(input, min, max);
}

// An expiry: decimal text near the tests' clock or anything else.
inline std::string expiryOf(FuzzedDataProvider& input) {
  if (input.ConsumeBool()) return textOf(input, 1, 128);
  return std::to_string(input.ConsumeIntegralInRange<std::int64_t>(1'699'999'990, 1'700'000'090));
}

// An address, or anything else.
inline std::string addressOf(FuzzedDataProvider& input) {
  const std::string good = input.PickValueInArray(
      {"", "192.0.2.7", "2001:db8::7", "::ffff:192.0.2.7", "fe80::1%", "None"});
  return input.ConsumeBool() ? good + input.ConsumeRandomLengthString(300) : good;
}
