// SPDX-License-Identifier: Apache-2.0
#include "client/SessionState.h"

#include <string_view>
#include <utility>

#include "platform/linux/messagepack/RpcWriter.h"
#include "protocol/Requests.h"

namespace tonewerk {

using Kind = SessionChange::Kind;

namespace {

// If a configuration has only the second name, the daemon uses its value for the first. When the merged
// configuration is sent again, it has both, and the daemon would use the first. So the value is stored under
// the first name as well.
constexpr std::string_view kApplicationName = "HostApplicationDisplayID";
constexpr std::string_view kOtherApplicationName = "QMHostApplicationDisplayID";

void merge(ValueMap& configuration, const ValueMap& update) {
  const Value* name = update.find(kOtherApplicationName);
  if (name != nullptr) configuration.set(SharedString(kApplicationName), *name);
  configuration.merge(update);
}

}  // namespace

void SessionState::apply(const SessionChange& change) {
  switch (change.kind) {
    case Kind::kCreate:
      *this = SessionState();
      exists = true;
      return;
    case Kind::kServiceType:
      isStarted = isStarted && serviceType == change.serviceType;
      serviceType = change.serviceType;
      return;
    case Kind::kConfiguration:
      merge(configuration, change.configuration);
      return;
    case Kind::kStart:
      isStarted = true;
      return;
    case Kind::kStop:
      isStarted = false;
      return;
    case Kind::kDestroy:
      *this = SessionState();
      return;
  }
}

std::vector<SessionChange> changesBetween(const SessionState& from, const SessionState& to) {
  std::vector<SessionChange> changes;
  SessionState state = from;
  const auto add = [&](SessionChange change) {
    state.apply(change);
    changes.push_back(std::move(change));
  };
  if (!to.exists) {
    if (from.exists) add({Kind::kDestroy, TWR_SERVICE_UNKNOWN, {}});
    return changes;
  }
  if (!state.exists) add({Kind::kCreate, TWR_SERVICE_UNKNOWN, {}});
  if (state.serviceType != to.serviceType) add({Kind::kServiceType, to.serviceType, {}});
  if (state.configuration != to.configuration)
    add({Kind::kConfiguration, TWR_SERVICE_UNKNOWN, to.configuration});
  if (state.isStarted != to.isStarted)
    add({to.isStarted ? Kind::kStart : Kind::kStop, TWR_SERVICE_UNKNOWN, {}});
  return changes;
}

void appendChange(std::string& out, const SessionChange& change, std::int64_t reporterID) {
  switch (change.kind) {
    case Kind::kCreate:
      return RpcWriter(out).body(requests::kCreateReportingSession.name, {Value(reporterID)});
    case Kind::kServiceType:
      return RpcWriter(out).body(requests::kSetServiceType.name,
                                 {Value(change.serviceType), Value(reporterID)});
    case Kind::kConfiguration:
      return RpcWriter(out).body(requests::kSetConfiguration.name,
                                 {Value(change.configuration), Value(reporterID)});
    case Kind::kStart:
      return RpcWriter(out).body(requests::kStartReportingSessionForID.name, {Value(reporterID)});
    case Kind::kStop:
      return RpcWriter(out).body(requests::kStopReportingSessionForID.name, {Value(reporterID)});
    case Kind::kDestroy:
      return RpcWriter(out).body(requests::kDestroyReportingSession.name, {Value(reporterID)});
  }
}

}  // namespace tonewerk
