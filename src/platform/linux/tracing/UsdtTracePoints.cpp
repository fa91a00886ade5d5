// SPDX-License-Identifier: Apache-2.0
#include "platform/linux/tracing/UsdtTracePoints.h"

#include <sys/sdt.h>

#include "tonewerk/signpost.h"

namespace tonewerk {

void UsdtTracePoints::emit(std::uint32_t code) { DTRACE_PROBE1(tonewerk, event, code); }

void UsdtTracePoints::beginInterval(const char* name, std::int64_t identifier) {
  signpost::begin(name, static_cast<std::uint64_t>(identifier));
}

void UsdtTracePoints::endInterval(const char* name, std::int64_t identifier) {
  signpost::end(name, static_cast<std::uint64_t>(identifier));
}

}  // namespace tonewerk
