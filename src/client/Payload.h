// SPDX-License-Identifier: Apache-2.0
#pragma once

#include <cstdint>
#include <optional>
#include <string>
#include <string_view>

#include "tonewerk/reporting.h"
#include "values/Value.h"

namespace tonewerk {

// A flag of twr_payload::flags: the outermost container is a list, for a request's parameters.
inline constexpr std::uint32_t kPayloadIsList = 1;

// Why `payload` cannot be a message or a configuration; TWR_OK when it can.
[[nodiscard]] inline twr_status problemOfMap(const twr_payload& payload) {
  if (payload.problem != TWR_OK) return static_cast<twr_status>(payload.problem);
  return payload.depth == 0 && (payload.flags & kPayloadIsList) == 0 ? TWR_OK : TWR_INVALID;
}

// Appends the part of a request or a notification that follows its head: the method and its parameters, which
// are a list payload, or null for none.
void appendRequestBody(std::string& out, std::string_view method, const twr_payload* parameters);

// Reads a payload's entries as a map. None when they are not valid, which only happens when the program wrote
// into the payload's memory.
[[nodiscard]] std::optional<ValueMap> mapOf(const twr_payload& payload);

}  // namespace tonewerk
