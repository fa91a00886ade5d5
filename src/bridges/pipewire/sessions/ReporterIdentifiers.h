// SPDX-License-Identifier: Apache-2.0
#pragma once

#include <cstdint>

#include "platform/Clock.h"

namespace tonewerk {

// Chooses reporter identifiers: never one that this run or a recent one has had, and none that another bridge
// chooses at the same time.
//
// An identifier is the time in milliseconds, followed by ten bits of the process identifier. Within a run the
// first part always grows, also when the wall clock stands or goes back. All are above 1 and below 2^53, so
// that programs that read the reports' JSON into doubles see them unharmed.
class ReporterIdentifiers {
 public:
  // `clock` outlives this.
  ReporterIdentifiers(const Clock& clock, std::int64_t processIdentifier);

  std::int64_t next();

 private:
  const Clock& clock_;
  std::int64_t processBits_;
  std::int64_t lastMilliseconds_ = 0;
};

}  // namespace tonewerk
