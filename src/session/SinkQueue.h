// SPDX-License-Identifier: Apache-2.0
#pragma once

#include <cstddef>
#include <memory>

#include "platform/SerialQueue.h"
#include "values/Mutex.h"

namespace tonewerk {

// Runs a sink's slow work on a serial queue, and limits how much memory the queued work holds.
//
// submit() waits while the queued work holds more than kMaxWaitingBytes. The work queue then waits too, and
// so do the clients, whose sockets are not read. Thus nothing that was accepted is dropped. The destructor
// runs what is still queued.
class SinkQueue {
 public:
  static constexpr std::size_t kMaxWaitingBytes = std::size_t{64} << 20;

  explicit SinkQueue(std::unique_ptr<SerialQueue> queue);
  ~SinkQueue();

  // Queues `work`, which holds `bytes`. Any thread but the queue's own. A piece larger than the bound waits
  // until the queue is empty.
  void submit(std::size_t bytes, Task work);

  // Queues `work` without waiting. Any thread. For work that holds few bytes and is bounded by other means.
  void post(Task work);

  // Returns when everything submitted before has run.
  void drain();

  // As in SerialQueue.
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
