// SPDX-License-Identifier: Apache-2.0
#pragma once

#include <cstddef>

namespace tonewerk {

// Limits how many bytes the sessions of one client keep together: messages, previous values and
// configurations. Used on the work queue.
class KeptBytesBudget {
 public:
  static constexpr std::size_t kMaxKeptBytes = std::size_t{256} << 20;

  explicit KeptBytesBudget(std::size_t limitBytes = kMaxKeptBytes) : limit_(limitBytes) {}

  bool hasRoomFor(std::size_t bytes) const { return bytes <= limit_ - used_; }

  // Takes `bytes`. Returns false, and takes nothing, when they do not fit.
  [[nodiscard]] bool take(std::size_t bytes) {
    if (!hasRoomFor(bytes)) return false;
    used_ += bytes;
    return true;
  }
  // Gives back bytes that were taken.
  void give(std::size_t bytes) { used_ -= bytes; }

  std::size_t used() const { return used_; }
  std::size_t limit() const { return limit_; }

  // Returns true on the first call only. The caller logs then, so that each client over its budget is
  // logged once.
  bool isFirstRefusal() {
    const bool first = !hasRefused_;
    hasRefused_ = true;
    return first;
  }

 private:
  const std::size_t limit_;
  std::size_t used_ = 0;
  bool hasRefused_ = false;
};

}  // namespace tonewerk
