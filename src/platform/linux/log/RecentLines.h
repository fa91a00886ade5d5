// SPDX-License-Identifier: Apache-2.0
#pragma once

#include <cstddef>
#include <deque>
#include <string>
#include <string_view>

#include "values/Mutex.h"

namespace tonewerk {

// Keeps the last lines of a text that grows without end. Any thread.
class RecentLines {
 public:
  struct Limits {
    std::size_t lines = 1000;
    std::size_t bytes = std::size_t{256} << 10;
    std::size_t lineBytes = 4096;  // longer lines are cut; at most `bytes`
  };

  RecentLines() : RecentLines(Limits()) {}
  explicit RecentLines(const Limits& limits) : limits_(limits) {}

  // `line` may end with a newline or not.
  void add(std::string_view line);

  // The lines, oldest first, each with a newline.
  std::string text() const;

 private:
  const Limits limits_;
  mutable Mutex mutex_;
  std::deque<std::string> lines_ GUARDED_BY(mutex_);
  std::size_t bytes_ GUARDED_BY(mutex_) = 0;
};

}  // namespace tonewerk
