// SPDX-License-Identifier: Apache-2.0
#pragma once

#include <string_view>

namespace tonewerk {

// Sets the name that debuggers and process tables show. The kernel allows 15 bytes. Of a longer name the last
// 15 are used, because names such as "com.orvane.audio.work" differ at their end.
void nameThisThread(std::string_view name);

// From -20 (highest priority) to 19 (lowest). Values below 0 need a permission; without it the niceness stays
// unchanged.
void setNicenessOfThisThread(int niceness);

}  // namespace tonewerk
