// SPDX-License-Identifier: Apache-2.0
#pragma once

#include <cstdint>
#include <string>

#include "values/ValueMap.h"

namespace tonewerk {

// Where sessions go: the reporting daemon.
//
// Nothing fails and nothing waits. Before the daemon is there everything is swallowed, and its users are then
// told to begin their sessions; when it has been away, they are told to say how things stand (see
// DaemonLink).
class SessionSink {
 public:
  virtual ~SessionSink() = default;

  virtual void create(std::int64_t reporterID) = 0;
  virtual void configure(std::int64_t reporterID, std::uint16_t serviceType,
                         const ValueMap& configuration) = 0;
  virtual void start(std::int64_t reporterID) = 0;
  virtual void message(std::int64_t reporterID, std::uint32_t category, std::uint16_t type,
                       ValueMap message) = 0;
  virtual void stop(std::int64_t reporterID) = 0;
  virtual void destroy(std::int64_t reporterID) = 0;
};

}  // namespace tonewerk
