// SPDX-License-Identifier: Apache-2.0
#include "support/manual/ManualQueues.h"

#include <algorithm>

namespace tonewerk {

std::unique_ptr<SerialQueue> ManualQueues::makeSerialQueue(std::string name, QueuePriority priority) {
  auto queue = std::make_unique<ManualSerialQueue>(std::move(name), priority);
  ManualSerialQueue* remembered = queue.get();
  queues_.push_back(remembered);
  queue->setDestructionHandler([this, remembered] { std::erase(queues_, remembered); });
  return queue;
}

ManualSerialQueue* ManualQueues::find(std::string_view name) const {
  const auto found =
      std::find_if(queues_.begin(), queues_.end(), [&](const auto* queue) { return queue->name() == name; });
  return found == queues_.end() ? nullptr : *found;
}

std::vector<std::string> ManualQueues::names() const {
  std::vector<std::string> names;
  for (const ManualSerialQueue* queue : queues_) names.push_back(queue->name());
  return names;
}

std::size_t ManualQueues::runAll() {
  std::size_t count = 0;
  for (bool ran = true; ran;) {
    ran = false;
    // By index, because work may make queues and destroy others.
    for (std::size_t at = 0; at < queues_.size(); ++at) {
      const std::size_t some = queues_[at]->runAll();
      count += some;
      ran = ran || some > 0;
    }
  }
  return count;
}

}  // namespace tonewerk
