// SPDX-License-Identifier: Apache-2.0
#pragma once

#include <algorithm>
#include <cstddef>
#include <cstdint>
#include <cstdlib>
#include <cstring>
#include <string>
#include <string_view>

namespace tonewerk {

// Ends the program, which the fuzzer reports as a finding, unless `condition` holds.
inline void expect(bool condition) {
  if (!condition) std::abort();
}

// Reads an input as a sequence of choices. At the end of the input every choice is 0 and every text is empty.
class FuzzInput {
 public:
  FuzzInput(const std::uint8_t* data, std::size_t size) : rest_(reinterpret_cast<const char*>(data), size) {}

  bool empty() const { return rest_.empty(); }

  std::uint8_t byte() { return number<std::uint8_t>(); }
  // A number in this machine's byte order.
  template <typename Number>
  Number number() {
    Number value{};
    const std::string_view bytes = take(sizeof(value));
    std::memcpy(&value, bytes.data(), bytes.size());
    return value;
  }
  // A number below `end`, which is from 1 to 256.
  std::size_t below(std::size_t end) { return byte() % end; }

  // A text whose length is the byte before it.
  std::string_view shortText() { return take(byte()); }
  // A text whose length is the two bytes before it.
  std::string_view longText() { return take(number<std::uint16_t>()); }
  // All that is left.
  std::string_view rest() { return take(rest_.size()); }

 private:
  std::string_view take(std::size_t size) {
    const std::string_view taken = rest_.substr(0, size);
    rest_.remove_prefix(taken.size());
    return taken;
  }

  std::string_view rest_;
};

}  // namespace tonewerk
