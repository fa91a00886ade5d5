// SPDX-License-Identifier: Apache-2.0
#pragma once

#include <cstddef>

#include "values/Value.h"

namespace tonewerk {

class TWReportingServiceDelegateProtocol;

// As many sessions as one answer of this kind holds, and what they come to at most.
inline constexpr std::size_t kMaxListedSessions = 500;
inline constexpr std::size_t kMaxSessionListingBytes = std::size_t{512} << 10;

// {"total", "sessions"}: how many sessions there are, and a portion of them with what they are and do, in
// order of connection and identifier, the single-message session last. `first` are left out before it. On the
// work queue.
ValueMap sessionListing(const TWReportingServiceDelegateProtocol& service, std::size_t first);

}  // namespace tonewerk
