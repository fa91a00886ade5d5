// SPDX-License-Identifier: Apache-2.0
#pragma once

#include <map>
#include <memory>
#include <string>

#include "workers/diagnostics/WorkerInstanceState.h"

namespace tonewerk {

// Holds the states that the instances of all sessions share, by the name of the instances' class. The process
// has one, which the first capture worker makes. Lives on the work queue.
struct SharedWorkerInstanceStates {
  std::map<std::string, std::shared_ptr<WorkerInstanceState>, std::less<>> byClassName;
};

}  // namespace tonewerk
