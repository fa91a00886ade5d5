// SPDX-License-Identifier: Apache-2.0
#include "service/SessionListing.h"

#include <cassert>
#include <chrono>
#include <memory>
#include <optional>
#include <string>
#include <utility>
#include <vector>

#include "platform/Clock.h"
#include "protocol/WatchKeys.h"
#include "service/TWReportingClientServerInstance.h"
#include "service/TWReportingServiceDelegateProtocol.h"
#include "session/TWReportingContext.h"
#include "session/TWReportingKeys.h"
#include "session/TWReportingSession.h"
#include "session/TWReportingUtility.h"
#include "values/ShortenedText.h"

namespace tonewerk {

std::string shownDevice(const TWReportingSession& session) {
  return std::string(
      shortened(session.previousText(TWReportingMessageKeyActiveDevices), kMaxShownDeviceBytes));
}

Value shownApplication(const ValueMap& map) {
  return shortened(TWReportingUtilityRetrieveAppName(map), kMaxShownNameBytes);
}

namespace {

// Collects one portion of a long list of sessions.
class Portion {
 public:
  explicit Portion(std::size_t first) : first_(first) {}

  // Skips the next `count` sessions when none of them belongs to the portion. Returns whether it skipped
  // them.
  bool skip(std::size_t count) {
    if (count_ + count > first_ && listed_.size() < kMaxListedSessions) return false;
    count_ += count;
    return true;
  }
  void add(const TWReportingSession& session, const std::optional<std::string>& processName);

  ValueMap answer() {
    return {{kWatchKeyTotal, count_}, {kWatchKeySessions, ValueArray(std::move(listed_))}};
  }

 private:
  const std::size_t first_;
  const std::chrono::nanoseconds now_ = TWReportingContext::current().platform().clock.monotonic();
  std::size_t count_ = 0;
  std::vector<Value> listed_;
};

void Portion::add(const TWReportingSession& session, const std::optional<std::string>& processName) {
  if (skip(1)) return;
  ++count_;
  ValueMap shown{{kWatchKeyReporterID, session.reporterID()},
                 {kWatchKeyServiceType, session.serviceType()},
                 {kWatchKeyServiceName, session.serviceName()},
                 {kWatchKeyStarted, session.started()},
                 {kWatchKeySingleMessageSession, session.isSingleMessageSession()},
                 {kWatchKeyApplication, shownApplication(session.configuration())},
                 {kWatchKeyMessages, session.totalMessageCount()},
                 {kWatchKeyRedundant, session.redundantMessageCount()},
                 {kWatchKeyOverloads, session.overloadCount()}};
  if (const std::string device = shownDevice(session); !device.empty()) shown.set(kWatchKeyDevice, device);
  if (!session.processIdentifiers().empty()) {
    shown.set(kWatchKeyProcessIdentifier, session.processIdentifiers().front());
  }
  if (processName) shown.set(kWatchKeyProcessName, shortened(*processName, kMaxShownNameBytes));
  if (const auto since = session.startedAt()) {
    shown.set(kWatchKeySeconds, std::chrono::duration<double>(now_ - *since).count());
  }
  listed_.emplace_back(std::move(shown));
}

}  // namespace

ValueMap sessionListing(const TWReportingServiceDelegateProtocol& service, std::size_t first) {
  assert(TWReportingUtilityIsOnReportingServerQueue());
  Portion portion(first);
  for (const auto& client : service.getAllClients()) {
    const auto& sessions = client->clientReportingSessionMap();
    if (portion.skip(sessions.size())) continue;
    for (const auto& [reporterID, session] : sessions) portion.add(*session, client->clientProcessName());
  }
  for (const auto& session : service.currentSingleMessageSessions()) portion.add(*session, std::nullopt);
  return portion.answer();
}

}  // namespace tonewerk
