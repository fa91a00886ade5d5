// SPDX-License-Identifier: Apache-2.0
#pragma once

#include <string>
#include <vector>

#include "platform/TracePoints.h"
#include "values/Mutex.h"

namespace tonewerk {

// Records the emitted codes and the beginnings and ends of intervals, in order. Any thread.
//
//   EXPECT_THAT(tracePoints.codes(), ElementsAre(0x1u, 0x2u));
//   EXPECT_THAT(tracePoints.intervals(), ElementsAre("begin sendMessage 77", "end sendMessage 77"));
class MemoryTracePoints final : public TracePoints {
 public:
  void emit(std::uint32_t code) override {
    const MutexLock lock(mutex_);
    codes_.push_back(code);
  }

  void beginInterval(const char* name, std::int64_t identifier) override { add("begin ", name, identifier); }
  void endInterval(const char* name, std::int64_t identifier) override { add("end ", name, identifier); }

  std::vector<std::string> intervals() const {
    const MutexLock lock(mutex_);
    return intervals_;
  }
  std::vector<std::uint32_t> codes() const {
    const MutexLock lock(mutex_);
    return codes_;
  }
  void clear() {
    const MutexLock lock(mutex_);
    codes_.clear();
    intervals_.clear();
  }

 private:
  void add(const char* edge, const char* name, std::int64_t identifier) {
    const MutexLock lock(mutex_);
    intervals_.push_back(std::string(edge) + name + " " + std::to_string(identifier));
  }

  mutable Mutex mutex_;
  std::vector<std::uint32_t> codes_ GUARDED_BY(mutex_);
  std::vector<std::string> intervals_ GUARDED_BY(mutex_);
};

}  // namespace tonewerk
