// SPDX-License-Identifier: Apache-2.0
#include "platform/linux/UsdtTracePoints.h"

#include <sys/sdt.h>

namespace tonewerk {

void UsdtTracePoints::emit(std::uint32_t code) { DTRACE_PROBE1(tonewerk, event, code); }

}  // namespace tonewerk
