// SPDX-License-Identifier: Apache-2.0
#pragma once

#include <cstdint>
#include <limits>
#include <memory>
#include <optional>
#include <string>

#include "platform/FaultsignReporter.h"
#include "values/Date.h"
#include "values/ValueDigest.h"

namespace tonewerk {

// How often a capture worker's instance has seen its symptom, and what came of it. As it is made an instance
// never fires: no time is longer than its threshold. On the work queue.
struct WorkerInstanceState {
  // What the service called the last capture; none as long as it has not answered.
  std::optional<std::string> currentCapsaSessionIdentifier;

  std::int64_t interestedCount = 0;
  std::int64_t interestThresholdCount = -1;  // reached when the count is as high
  std::optional<Date> interestFirstSeen;
  double interestThresholdDurationSeconds = std::numeric_limits<double>::max();  // to be exceeded

  bool oncePerSession = false;
  std::int64_t firedCount = 0;
  // Of the payload of the last interesting message since the counting began. A digest, since a client may
  // have thousands of sessions and payloads of any size.
  std::optional<ValueDigest> lastMessage;
  // The one that the last firing used.
  std::unique_ptr<FaultsignReporter> symptomReporter;
};

}  // namespace tonewerk
