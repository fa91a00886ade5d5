// SPDX-License-Identifier: Apache-2.0
#pragma once

#include <cstdint>

#include "platform/Clock.h"

namespace tonewerk {

// Chooses reporter identifiers. No identifier repeats one of this run or of a recent run, and two bridges
// that run at the same time choose different ones.
//
// An identifier is the time in milliseconds, followed by ten bits of the process identifier. Within a run the
// time part always grows, also when the wall clock stops or goes back. All identifiers are above 1 and below
// 2^53, so programs that read the reports' JSON into doubles get the exact values.
class ReporterIdentifiers {
 public:
  // `clock` outlives this object.
  ReporterIdentifiers(const Clock& clock, std::int64_t processIdentifier);

  std::int64_t next();

 private:
  const Clock& clock_;
  std::int64_t processBits_;
  std::int64_t lastMilliseconds_ = 0;
};

}  // namespace tonewerk
