// SPDX-License-Identifier: Apache-2.0
#pragma once

#include <cstdint>
#include <optional>
#include <string>

namespace tonewerk {

// Logs how long a client was connected whose connection has just ended, and sends it as an analytics event.
// Without a start date (seconds since 1970) the time is -1. Without a process name no event is sent. Any
// thread.
void sendClientUptime(std::int32_t processIdentifier, std::optional<double> startDate,
                      const std::optional<std::string>& processName);

}  // namespace tonewerk
