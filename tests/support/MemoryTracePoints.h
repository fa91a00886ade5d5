// SPDX-License-Identifier: Apache-2.0
#pragma once

#include <mutex>
#include <vector>

#include "platform/TracePoints.h"

namespace tonewerk {

// Keeps the codes it was given, in order. Any thread.
//
//   EXPECT_THAT(tracePoints.codes(), ElementsAre(0x1u, 0x2u));
class MemoryTracePoints final : public TracePoints {
 public:
  void emit(std::uint32_t code) override {
    const std::lock_guard lock(mutex_);
    codes_.push_back(code);
  }

  std::vector<std::uint32_t> codes() const {
    const std::lock_guard lock(mutex_);
    return codes_;
  }
  void clear() {
    const std::lock_guard lock(mutex_);
    codes_.clear();
  }

 private:
  mutable std::mutex mutex_;
  std::vector<std::uint32_t> codes_;  // guarded by mutex_
};

}  // namespace tonewerk
