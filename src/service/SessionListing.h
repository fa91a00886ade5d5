// SPDX-License-Identifier: Apache-2.0
#pragma once

#include <cstddef>

#include "values/Value.h"

namespace tonewerk {

class TWReportingServiceDelegateProtocol;

// As many sessions as one answer of this kind holds; they come to at most requests::kMaxSessionListingBytes.
inline constexpr std::size_t kMaxListedSessions = 500;

// {"total", "sessions"}: how many sessions there are, and a portion of them with what they are and do, in
// order of connection and identifier, the single-message session last. `first` are left out before it. On the
// work queue.
ValueMap sessionListing(const TWReportingServiceDelegateProtocol& service, std::size_t first);

// Names that clients choose are shown this long and no longer.
inline constexpr std::size_t kMaxShownNameBytes = 256;

// The application that a configuration, or a payload on its way to the workers, names.
Value shownApplication(const ValueMap& map);

}  // namespace tonewerk
