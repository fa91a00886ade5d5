// SPDX-License-Identifier: Apache-2.0
#pragma once

#include <cstdint>
#include <string>
#include <vector>

#include "tonewerk/reporting.h"
#include "values/Value.h"

namespace tonewerk {

// A request that changes a session.
struct SessionChange {
  enum class Kind { kCreate, kServiceType, kConfiguration, kStart, kStop, kDestroy };

  Kind kind = Kind::kCreate;
  std::uint16_t serviceType = TWR_SERVICE_UNKNOWN;  // for kServiceType
  ValueMap configuration;                           // for kConfiguration
};

// The state of a session, as the daemon knows it or as the caller wants it.
struct SessionState {
  bool exists = false;
  std::uint16_t serviceType = TWR_SERVICE_UNKNOWN;  // a new session has this one
  ValueMap configuration;
  bool isStarted = false;

  // Does what the daemon does: another service type makes the session again, which is then not started.
  void apply(const SessionChange& change);
};

// The requests that lead from one state to another, in order. Empty when the states are equal.
std::vector<SessionChange> changesBetween(const SessionState& from, const SessionState& to);

// Appends the change's method and parameters, which a request and a notification write in the same way.
void appendChange(std::string& out, const SessionChange& change, std::int64_t reporterID);

}  // namespace tonewerk
