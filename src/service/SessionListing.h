// SPDX-License-Identifier: Apache-2.0
#pragma once

#include <cstddef>
#include <string>

#include "values/Value.h"

namespace tonewerk {

class TWReportingServiceDelegateProtocol;
class TWReportingSession;

// The most sessions in one answer. They take at most requests::kMaxSessionListingBytes.
inline constexpr std::size_t kMaxListedSessions = 500;

// Returns {"total", "sessions"}: how many sessions there are, and a description of each session of a
// portion. The portion leaves out the first `first` sessions. Sessions are in the order of their clients'
// connections, then of their identifiers; the single-message sessions are the last. Call it on the work
// queue.
ValueMap sessionListing(const TWReportingServiceDelegateProtocol& service, std::size_t first);

// Names that clients choose are cut to this length.
inline constexpr std::size_t kMaxShownNameBytes = 256;

// Names of devices are cut to this length, so that the sessions of one answer fit.
inline constexpr std::size_t kMaxShownDeviceBytes = 64;

// Returns the devices that the session named last, cut to kMaxShownDeviceBytes; empty when it named none.
std::string shownDevice(const TWReportingSession& session);

// Returns the application name of a configuration or of a normalised payload, cut to kMaxShownNameBytes.
Value shownApplication(const ValueMap& map);

}  // namespace tonewerk
