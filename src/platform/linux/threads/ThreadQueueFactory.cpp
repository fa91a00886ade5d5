// SPDX-License-Identifier: Apache-2.0
#include "platform/linux/threads/ThreadQueueFactory.h"

#include "platform/linux/threads/ThreadQueue.h"

namespace tonewerk {

std::unique_ptr<SerialQueue> ThreadQueueFactory::makeSerialQueue(std::string name, QueuePriority priority) {
  return std::make_unique<ThreadQueue>(std::move(name), priority);
}

}  // namespace tonewerk
