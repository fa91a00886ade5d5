// SPDX-License-Identifier: Apache-2.0
#pragma once

#include <chrono>
#include <cstddef>
#include <cstdint>
#include <memory>
#include <string>

#include "values/Mutex.h"

namespace tonewerk {

// Passes the newest state on to any number of readers. A reader that is slow misses states in between, so
// nothing is kept for it. Any thread.
class LiveFeed {
 public:
  // Replaces the state, a JSON object.
  void publish(std::string state);

  // Waits until the state is newer than `number`, at most for `patience`, and sets `number` to that of the
  // state. Null when there was none, or after end().
  [[nodiscard]] std::shared_ptr<const std::string> newerThan(std::uint64_t& number,
                                                             std::chrono::milliseconds patience);

  // Lets no reader wait any longer. Its streams end.
  void end();
  [[nodiscard]] bool hasEnded() const;

  // Counts the readers. A reader exists while it waits for states, or reads them.
  class Reader {
   public:
    explicit Reader(LiveFeed& feed);
    Reader(const Reader&) = delete;
    Reader& operator=(const Reader&) = delete;
    ~Reader();

   private:
    LiveFeed& feed_;
  };
  [[nodiscard]] std::size_t readers() const;

 private:
  mutable Mutex mutex_;
  Condition changed_;
  std::shared_ptr<const std::string> state_ GUARDED_BY(mutex_);
  std::uint64_t number_ GUARDED_BY(mutex_) = 0;
  std::size_t readers_ GUARDED_BY(mutex_) = 0;
  bool hasEnded_ GUARDED_BY(mutex_) = false;
};

}  // namespace tonewerk
