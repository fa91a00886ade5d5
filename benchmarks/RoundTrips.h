// SPDX-License-Identifier: Apache-2.0
#pragma once

#include <cstddef>
#include <string>

#include "IngestClients.h"
#include "Latencies.h"

namespace tonewerk {

// Measures how long a client waits for the answer to a request while it also sends a flood of messages: a
// write each, with at most 256 of them unanswered. Every 100th request is measured.
//
// The client opens the sessions of its plan. One thread sends, another one receives. A failure or an error
// answer throws std::runtime_error.
Latencies measureRoundTrips(const std::string& socketPath, const IngestClientPlan& plan, std::size_t count);

}  // namespace tonewerk
