// SPDX-License-Identifier: Apache-2.0
#pragma once

#include <cstddef>
#include <memory>
#include <string>
#include <string_view>
#include <vector>

#include "support/manual/ManualSerialQueue.h"

namespace tonewerk {

// Makes queues that the test runs by hand, and remembers them while they live.
//
//   ManualQueues queues;
//   auto service = makeService(queues);
//   queues.runAll();                         // every queue, until none has work
//   queues.find("com.orvane.work")->runAll();
//
// One thread. Outlives its queues.
class ManualQueues final : public SerialQueueFactory {
 public:
  [[nodiscard]] std::unique_ptr<SerialQueue> makeSerialQueue(std::string name,
                                                             QueuePriority priority) override;

  // Returns null when no living queue has the name, and the first when several have it.
  ManualSerialQueue* find(std::string_view name) const;
  // Returns the names of the living queues, in the order in which they were made.
  std::vector<std::string> names() const;
  // Returns how many pieces of work ran.
  std::size_t runAll();

 private:
  std::vector<ManualSerialQueue*> queues_;
};

}  // namespace tonewerk
