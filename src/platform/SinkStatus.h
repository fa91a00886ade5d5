// SPDX-License-Identifier: Apache-2.0
#pragma once

#include <chrono>
#include <cstdint>
#include <functional>
#include <string>
#include <utility>
#include <vector>

#include "values/Mutex.h"

namespace tonewerk {

// How the queue of a sink stands. A sink writes to something that may hang, such as a disk or a network.
struct SinkStatus {
  std::string name;            // for people and programs, such as "store"
  std::uint64_t waiting = 0;   // what is not written yet, in the sink's own pieces
  std::uint64_t dropped = 0;   // what was lost since the daemon's start
  std::chrono::seconds hangs;  // how long it has made no progress while something waits; 0 when it moves
};

// All sinks of the daemon, in the order in which they were added. Any thread.
class SinkList {
 public:
  using Source = std::function<SinkStatus()>;

  // `source` may be called until the list ends, on any thread.
  void add(Source source) {
    const MutexLock lock(mutex_);
    sources_.push_back(std::move(source));
  }

  std::vector<SinkStatus> all() const {
    std::vector<Source> sources;
    {
      const MutexLock lock(mutex_);
      sources = sources_;
    }
    std::vector<SinkStatus> statuses;
    statuses.reserve(sources.size());
    for (const Source& source : sources) statuses.push_back(source());
    return statuses;
  }

 private:
  mutable Mutex mutex_;
  std::vector<Source> sources_ GUARDED_BY(mutex_);
};

}  // namespace tonewerk
