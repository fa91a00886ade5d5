// SPDX-License-Identifier: Apache-2.0
#pragma once

#include <cstddef>
#include <deque>
#include <string>
#include <string_view>

#include "values/Mutex.h"

namespace tonewerk {

// The last lines of something that goes on. Any thread.
class RecentLines {
 public:
  struct Limits {
    std::size_t lines = 1000;
    std::size_t bytes = std::size_t{256} << 10;
    std::size_t lineBytes = 4096;  // longer ones are cut; not above `bytes`
  };

  RecentLines() : RecentLines(Limits()) {}
  explicit RecentLines(const Limits& limits) : limits_(limits) {}

  // With or without a newline at its end.
  void add(std::string_view line);

  // Oldest first, a newline behind each.
  std::string text() const;

 private:
  const Limits limits_;
  mutable Mutex mutex_;
  std::deque<std::string> lines_ GUARDED_BY(mutex_);
  std::size_t bytes_ GUARDED_BY(mutex_) = 0;
};

}  // namespace tonewerk
