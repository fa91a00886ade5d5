// SPDX-License-Identifier: Apache-2.0
#pragma once

#include <cstdint>
#include <optional>
#include <string>
#include <string_view>

#include "tonewerk/reporting.h"
#include "values/Value.h"

namespace tonewerk {

// Of twr_payload::flags: the outermost container is a list, for a request's parameters.
inline constexpr std::uint32_t kPayloadIsList = 1;

// Why a message or a configuration cannot be made of `payload`; TWR_OK for nothing.
[[nodiscard]] inline twr_status problemOfMap(const twr_payload& payload) {
  const twr_status problem = twr_payload_problem(&payload);
  if (problem != TWR_OK) return problem;
  return (payload.flags & kPayloadIsList) == 0 ? TWR_OK : TWR_INVALID;
}

// Appends what a request or a notification of `method` has after its head, with a list payload for its
// parameters; null for none.
void appendRequestBody(std::string& out, std::string_view method, const twr_payload* parameters);

// A payload's entries as a map; none when they are not what the protocol carries, which only happens when
// somebody else wrote into the payload's memory.
[[nodiscard]] std::optional<ValueMap> mapOf(const twr_payload& payload);

}  // namespace tonewerk
