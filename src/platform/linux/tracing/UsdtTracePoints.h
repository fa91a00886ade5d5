// SPDX-License-Identifier: Apache-2.0
#pragma once

#include "platform/TracePoints.h"

namespace tonewerk {

// The static probe "event" of the provider "tonewerk", whose one argument is the code. A single no-operation
// instruction while no tracer listens:
//
// Intervals are signposts, as audio programs have them.
//
//   bpftrace -e 'usdt:/usr/bin/twreportingd:tonewerk:event { printf("%d\n", arg0) }'
class UsdtTracePoints final : public TracePoints {
 public:
  void emit(std::uint32_t code) override;
  void beginInterval(const char* name, std::int64_t identifier) override;
  void endInterval(const char* name, std::int64_t identifier) override;
};

}  // namespace tonewerk
