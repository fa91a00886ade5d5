// SPDX-License-Identifier: Apache-2.0
#pragma once

#include <cstddef>

namespace tonewerk {

// How much the sessions of one client may keep together: messages, previous values, configurations. On the
// work queue.
class KeptBytesBudget {
 public:
  static constexpr std::size_t kMaxKeptBytes = std::size_t{256} << 20;

  explicit KeptBytesBudget(std::size_t mostBytes = kMaxKeptBytes) : most_(mostBytes) {}

  bool hasRoomFor(std::size_t bytes) const { return bytes <= most_ - used_; }

  // Whether `bytes` more fit; takes them when they do.
  [[nodiscard]] bool take(std::size_t bytes) {
    if (!hasRoomFor(bytes)) return false;
    used_ += bytes;
    return true;
  }
  // Gives back what was taken.
  void give(std::size_t bytes) { used_ -= bytes; }

  std::size_t used() const { return used_; }
  std::size_t most() const { return most_; }

  // True the first time, so that a client over its budget is told of once.
  bool isFirstRefusal() {
    const bool first = !hasRefused_;
    hasRefused_ = true;
    return first;
  }

 private:
  const std::size_t most_;
  std::size_t used_ = 0;
  bool hasRefused_ = false;
};

}  // namespace tonewerk
