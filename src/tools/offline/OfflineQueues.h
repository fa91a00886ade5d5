// SPDX-License-Identifier: Apache-2.0
#pragma once

#include <memory>
#include <string>
#include <vector>

#include "platform/SerialQueue.h"

namespace tonewerk {

class OfflineQueue;

// Makes queues whose work runs on the replay's own thread, so that it always runs in the same order:
//
// - The work queue's runs when the replay says so.
// - A sink's runs at once, inside async(), unless the queue runs already. So it comes right after what caused
//   it, and a queue with a bound never waits for room.
//
// One thread. Outlives its queues.
class OfflineQueues final : public SerialQueueFactory {
 public:
  OfflineQueues() = default;
  OfflineQueues(const OfflineQueues&) = delete;
  OfflineQueues& operator=(const OfflineQueues&) = delete;
  ~OfflineQueues() override = default;

  // A queue of QueuePriority::kUserInteractive is the work queue, all others are those of sinks.
  [[nodiscard]] std::unique_ptr<SerialQueue> makeSerialQueue(std::string name,
                                                             QueuePriority priority) override;

  // Runs work until no queue has any.
  void runAll();

 private:
  friend class OfflineQueue;

  std::vector<OfflineQueue*> queues_;  // those that live, in the order in which they were made
};

}  // namespace tonewerk
