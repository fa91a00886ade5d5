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

// Records how often an instance of the capture worker has seen its symptom and what was captured. With the
// initial thresholds an instance never fires, because no time exceeds its threshold. Lives on the work queue.
struct WorkerInstanceState {
  // The session identifier from the service's latest answer, or "NONE_RETURNED". nullopt before the first
  // answer.
  std::optional<std::string> currentCapsaSessionIdentifier;

  std::int64_t interestedCount = 0;
  std::int64_t interestThresholdCount = -1;  // reached when the count is at least this
  std::optional<Date> interestFirstSeen;
  double interestThresholdDurationSeconds = std::numeric_limits<double>::max();  // must be exceeded

  bool oncePerSession = false;
  std::int64_t firedCount = 0;
  // The digest of the last interesting message's payload since the counting began. Only a digest is kept,
  // because a client may have thousands of sessions and payloads of any size.
  std::optional<ValueDigest> lastMessage;
  // The reporter that was made for the last firing.
  std::unique_ptr<FaultsignReporter> symptomReporter;
};

}  // namespace tonewerk
