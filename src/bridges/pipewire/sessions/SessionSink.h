// SPDX-License-Identifier: Apache-2.0
#pragma once

#include <cstdint>
#include <string>

#include "values/ValueMap.h"

namespace tonewerk {

// Receives sessions and their messages; the real one is the reporting daemon.
//
// No call fails or waits. Calls made before the daemon is there are ignored, and the users are asked to begin
// their sessions when it comes. After the daemon was away, they are asked to send their present state (see
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
