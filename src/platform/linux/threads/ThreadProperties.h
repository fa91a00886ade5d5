// SPDX-License-Identifier: Apache-2.0
#pragma once

#include <string_view>

namespace tonewerk {

// The name that debuggers and process tables show; the kernel keeps the last 15 bytes of it, because names
// such as "com.orvane.audio.work" differ at their end.
void nameThisThread(std::string_view name);

// From -20 (first) to 19 (last). Below 0 only for processes that may; for others the thread stays as it is.
void setNicenessOfThisThread(int niceness);

}  // namespace tonewerk
