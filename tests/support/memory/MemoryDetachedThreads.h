// SPDX-License-Identifier: Apache-2.0
#pragma once

#include <map>
#include <string>
#include <system_error>
#include <thread>
#include <vector>

#include "platform/DetachedThreads.h"
#include "values/Mutex.h"

namespace tonewerk {

// Starts real threads; the destructor joins them. Any thread.
//
//   test.threads.refuse("twr-memory-0", std::errc::resource_unavailable_try_again);
//   EXPECT_THAT(test.threads.started(), ElementsAre("twr-memory-1"));
class MemoryDetachedThreads final : public DetachedThreads {
 public:
  MemoryDetachedThreads() = default;
  MemoryDetachedThreads(const MemoryDetachedThreads&) = delete;
  MemoryDetachedThreads& operator=(const MemoryDetachedThreads&) = delete;
  ~MemoryDetachedThreads() override {
    for (std::thread& thread : threads_) thread.join();
  }

  [[nodiscard]] std::error_code start(std::string_view name, Task work) override {
    const MutexLock lock(mutex_);
    if (const auto refusal = refusals_.find(name); refusal != refusals_.end()) {
      return std::make_error_code(refusal->second);
    }
    started_.emplace_back(name);
    threads_.emplace_back([work = std::move(work)] { work(); });
    return {};
  }

  // From now on no thread with that name can be started.
  void refuse(const std::string& name, std::errc error) {
    const MutexLock lock(mutex_);
    refusals_[name] = error;
  }
  // Returns the names of the threads that were started, in order.
  std::vector<std::string> started() const {
    const MutexLock lock(mutex_);
    return started_;
  }

 private:
  mutable Mutex mutex_;
  std::map<std::string, std::errc, std::less<>> refusals_ GUARDED_BY(mutex_);
  std::vector<std::string> started_ GUARDED_BY(mutex_);
  std::vector<std::thread> threads_ GUARDED_BY(mutex_);
};

}  // namespace tonewerk
