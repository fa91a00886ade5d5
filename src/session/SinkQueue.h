// SPDX-License-Identifier: Apache-2.0
#pragma once

#include <cstddef>
#include <memory>

#include "platform/SerialQueue.h"
#include "values/Mutex.h"

namespace tonewerk {

// A serial queue for a sink's slow work, bounded by the memory that waits on it.
//
// submit() waits while more than kMaxWaitingBytes wait: the work queue then waits too, and through the
// socket the clients do, so that nothing accepted is dropped. Destroying it runs what is queued.
class SinkQueue {
 public:
  static constexpr std::size_t kMaxWaitingBytes = std::size_t{64} << 20;

  explicit SinkQueue(std::unique_ptr<SerialQueue> queue);
  ~SinkQueue();

  // Any thread but the queue's own. `bytes`: what `work` holds. A piece larger than the bound waits for an
  // empty queue only.
  void submit(std::size_t bytes, Task work);

  // Any thread; never waits. For work that keeps next to nothing and is bounded by other means.
  void post(Task work);

  // Returns when everything submitted before has run.
  void drain();

  // As SerialQueue's.
  bool isCurrent() const;
  bool ownsThisThread() const;

 private:
  bool hasRoomFor(std::size_t bytes) const REQUIRES(mutex_);
  void finished(std::size_t bytes);

  Mutex mutex_;
  Condition roomMade_;
  std::size_t waitingBytes_ GUARDED_BY(mutex_) = 0;
  std::unique_ptr<SerialQueue> queue_;
};

}  // namespace tonewerk
