// SPDX-License-Identifier: Apache-2.0
#pragma once

#include <mutex>
#include <string>
#include <vector>

#include "platform/TracePoints.h"

namespace tonewerk {

// Keeps the codes it was given and the intervals' ends, in order. Any thread.
//
//   EXPECT_THAT(tracePoints.codes(), ElementsAre(0x1u, 0x2u));
//   EXPECT_THAT(tracePoints.intervals(), ElementsAre("begin sendMessage 77", "end sendMessage 77"));
class MemoryTracePoints final : public TracePoints {
 public:
  void emit(std::uint32_t code) override {
    const std::lock_guard lock(mutex_);
    codes_.push_back(code);
  }

  void beginInterval(const char* name, std::int64_t identifier) override { add("begin ", name, identifier); }
  void endInterval(const char* name, std::int64_t identifier) override { add("end ", name, identifier); }

  std::vector<std::string> intervals() const {
    const std::lock_guard lock(mutex_);
    return intervals_;
  }
  std::vector<std::uint32_t> codes() const {
    const std::lock_guard lock(mutex_);
    return codes_;
  }
  void clear() {
    const std::lock_guard lock(mutex_);
    codes_.clear();
    intervals_.clear();
  }

 private:
  void add(const char* edge, const char* name, std::int64_t identifier) {
    const std::lock_guard lock(mutex_);
    intervals_.push_back(std::string(edge) + name + " " + std::to_string(identifier));
  }

  mutable std::mutex mutex_;
  std::vector<std::uint32_t> codes_;    // guarded by mutex_
  std::vector<std::string> intervals_;  // guarded by mutex_
};

}  // namespace tonewerk
