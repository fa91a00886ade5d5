// SPDX-License-Identifier: Apache-2.0
#pragma once

#include "platform/SerialQueue.h"

namespace tonewerk {

// Makes queues that each have their own thread. Any thread.
class ThreadQueueFactory final : public SerialQueueFactory {
 public:
  [[nodiscard]] std::unique_ptr<SerialQueue> makeSerialQueue(std::string name,
                                                             QueuePriority priority) override;
};

}  // namespace tonewerk
