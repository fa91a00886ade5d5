// SPDX-License-Identifier: Apache-2.0
#pragma once

#include <optional>
#include <string>
#include <string_view>

#include "tonewerk/reporting.h"
#include "values/Value.h"

namespace tonewerk {

// Appends what a request or a notification of `method` has after its head, with a list payload for its
// parameters; null for none.
void appendRequestBody(std::string& out, std::string_view method, const twr_payload* parameters);

// A payload's entries as a map; none when they are not what the protocol carries, which only happens when
// somebody else wrote into the payload's memory.
std::optional<ValueMap> mapOf(const twr_payload& payload);

}  // namespace tonewerk
