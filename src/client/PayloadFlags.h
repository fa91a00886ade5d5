// SPDX-License-Identifier: Apache-2.0
#pragma once

#include <cstdint>

#include "tonewerk/reporting.h"

namespace tonewerk {

// Of twr_payload::flags: the outermost container is a list, for a request's parameters.
inline constexpr std::uint32_t kPayloadIsList = 1;

// Why a message or a configuration cannot be made of `payload`; TWR_OK for nothing.
inline twr_status problemOfMap(const twr_payload& payload) {
  const twr_status problem = twr_payload_problem(&payload);
  if (problem != TWR_OK) return problem;
  return (payload.flags & kPayloadIsList) == 0 ? TWR_OK : TWR_INVALID;
}

}  // namespace tonewerk
