// SPDX-License-Identifier: Apache-2.0
#pragma once

#include "platform/TracePoints.h"

namespace tonewerk {

// Emits trace points as the static probe "event" of the provider "tonewerk", with the code as its only
// argument. While no tracer is attached, a probe is a single no-operation instruction. To print the codes:
//
//   bpftrace -e 'usdt:/usr/bin/twreportingd:tonewerk:event { printf("%d\n", arg0) }'
//
// Intervals are signposts, like those of audio programs.
class UsdtTracePoints final : public TracePoints {
 public:
  void emit(std::uint32_t code) override;
  void beginInterval(const char* name, std::int64_t identifier) override;
  void endInterval(const char* name, std::int64_t identifier) override;
};

}  // namespace tonewerk
