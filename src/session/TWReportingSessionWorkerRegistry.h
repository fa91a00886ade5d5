// SPDX-License-Identifier: Apache-2.0
#pragma once

#include <vector>

#include "session/TWReportingSessionWorkerClass.h"

namespace tonewerk {

// Lists the process's worker classes by their roles. Filled by the constructor, then read on any thread.
class TWReportingSessionWorkerRegistry {
 public:
  using Classes = std::vector<const TWReportingSessionWorkerClass*>;

  // Fills the lists from `all`. A class whose workers cannot be made is logged and is in allClasses() only.
  explicit TWReportingSessionWorkerRegistry(Classes all);

  const Classes& allClasses() const { return all_; }
  const Classes& validClasses() const { return valid_; }
  const Classes& consumerClasses() const { return consumers_; }
  const Classes& producerClasses() const { return producers_; }
  const Classes& startOnInitClasses() const { return startOnInit_; }
  // The types of messages for which a worker of any class may wait.
  MessageTypes slowTypes() const { return slowTypes_; }

 private:
  Classes all_;
  Classes valid_;
  Classes consumers_;
  Classes producers_;
  Classes startOnInit_;
  MessageTypes slowTypes_ = MessageTypes::none();
};

}  // namespace tonewerk
