// SPDX-License-Identifier: Apache-2.0
#pragma once

#include <cstdint>
#include <string>
#include <vector>

#include "tonewerk/reporting.h"
#include "values/Value.h"

namespace tonewerk {

// One request that changes a session.
struct SessionChange {
  enum class Kind { kCreate, kServiceType, kConfiguration, kStart, kStop, kDestroy };

  Kind kind = Kind::kCreate;
  std::uint16_t serviceType = TWR_SERVICE_UNKNOWN;  // of kServiceType
  ValueMap configuration;                           // of kConfiguration
};

// What a session is, at the daemon or in its caller's mind.
struct SessionState {
  bool exists = false;
  std::uint16_t serviceType = TWR_SERVICE_UNKNOWN;  // which a new session has
  ValueMap configuration;
  bool isStarted = false;

  // As the daemon does it: another service type makes a session anew, which is not started.
  void apply(const SessionChange& change);
};

// The requests that lead from one state to another, in order. None when there is nothing to do.
std::vector<SessionChange> changesBetween(const SessionState& from, const SessionState& to);

// Appends the change's method and parameters, as both a request and a notification hold them.
void appendChange(std::string& out, const SessionChange& change, std::int64_t reporterID);

}  // namespace tonewerk
