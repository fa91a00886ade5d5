// SPDX-License-Identifier: Apache-2.0
#pragma once

#include <atomic>
#include <cstdint>
#include <map>
#include <set>

#include "protocol/AudioEvent.h"
#include "values/Mutex.h"

namespace tonewerk {

// What clients know of all lives of the daemon: what it has answered. Any thread.
class TortureLedger {
 public:
  struct Message {
    std::uint32_t user = 0;
    bool isSingle = false;  // it names no session
  };
  struct Answered {
    std::map<int, Message> messages;            // by their numbers
    std::set<ReporterID> played;                // sessions that must be summed up
    std::map<ReporterID, std::set<int>> filed;  // the numbers of messages in sessions that become files
  };

  // For a message or a session. None is given twice, and all are above the identifiers that mean something.
  int nextNumber() { return ++last_; }

  void message(int number, const Message& message) {
    const MutexLock lock(mutex_);
    answered_.messages.emplace(number, message);
  }
  void played(ReporterID session) {
    const MutexLock lock(mutex_);
    answered_.played.insert(session);
  }
  void filed(ReporterID session, int number) {
    const MutexLock lock(mutex_);
    answered_.filed[session].insert(number);
  }

  Answered answered() const {
    const MutexLock lock(mutex_);
    return answered_;
  }
  void clear() {
    const MutexLock lock(mutex_);
    answered_ = {};
  }

 private:
  std::atomic<int> last_ = 1000;
  mutable Mutex mutex_;
  Answered answered_ GUARDED_BY(mutex_);
};

}  // namespace tonewerk
