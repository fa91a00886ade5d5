// SPDX-License-Identifier: Apache-2.0
#include "service/DaemonListing.h"

#include <chrono>
#include <utility>
#include <vector>

#include "platform/DaemonStatus.h"
#include "protocol/WatchKeys.h"

namespace tonewerk {

ValueMap daemonListing(const DaemonStatus& status, bool isInternalBuild) {
  const std::chrono::duration<double> ran = std::chrono::steady_clock::now() - status.startedAtSteady;
  return {{kWatchKeyVersion, status.version},
          {kWatchKeyProcessIdentifier, status.processIdentifier},
          {kWatchKeyUser, status.user},
          {kWatchKeyStartedAt, status.startedAt},
          {kWatchKeySeconds, ran.count()},
          {kWatchKeyInternalBuild, isInternalBuild},
          {kWatchKeyRuntime, status.runtimeDirectory},
          {kWatchKeyState, status.stateDirectory},
          {kWatchKeyConfiguration, status.configurationDirectory}};
}

ValueArray endpointListing(const DaemonStatus& status) {
  std::vector<Value> listed;
  if (!status.endpoints) return {};
  for (const EndpointStatus& endpoint : status.endpoints()) {
    listed.emplace_back(ValueMap{{kWatchKeyName, endpoint.url},
                                 {kWatchKeyWaiting, endpoint.waiting},
                                 {kWatchKeyDropped, endpoint.dropped},
                                 {kWatchKeyHangs, static_cast<std::int64_t>(endpoint.hangs.count())},
                                 {kWatchKeyProblem, endpoint.problem}});
  }
  return ValueArray(std::move(listed));
}

ValueArray troubleListing(const DaemonStatus& status) {
  std::vector<Value> listed;
  if (!status.troubles) return {};
  for (const LoggedTrouble& line : status.troubles()) {
    ValueMap map{{kWatchKeyTime, line.lastAt},
                 {kWatchKeyCategory, line.category},
                 {kWatchKeyText, line.text},
                 {kWatchKeyTimes, line.times}};
    if (line.user) map.set(kWatchKeyUser, *line.user);
    listed.emplace_back(std::move(map));
  }
  return ValueArray(std::move(listed));
}

}  // namespace tonewerk
