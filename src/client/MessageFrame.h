// SPDX-License-Identifier: Apache-2.0
#pragma once

#include <cstddef>
#include <cstdint>
#include <optional>
#include <span>
#include <string>

#include "client/MessageRing.h"
#include "platform/linux/messagepack/RpcLimits.h"

namespace tonewerk {

// The most bytes of a frame besides the payload and the reporter identifiers.
inline constexpr std::size_t kMessageFrameBytes = 128;
inline constexpr std::size_t kReporterIDBytes = 9;

// True when a payload of that size makes a frame that the daemon accepts.
constexpr bool fitsMessageFrame(std::size_t payloadBytes, std::size_t reporterIDs) {
  constexpr std::size_t kRoom = kMaxFrameBytes - kMessageFrameBytes;
  return reporterIDs <= kRoom / kReporterIDBytes && payloadBytes <= kRoom - reporterIDs * kReporterIDBytes;
}

// Appends a "sendMessage" frame: a request, or, without an identifier, a notification. It contains the
// payload's own entries, "twreporting_timestamp" unless the payload has it, and "twreporting_dropped" when
// `dropped` is not 0. Without reporter identifiers the message is for every started session. Returns where in
// `out` the payload's own entries begin.
std::size_t appendMessageFrame(std::string& out, std::optional<std::uint32_t> requestIdentifier,
                               const RingMessage& message, std::uint64_t dropped,
                               std::span<const std::int64_t> reporterIDs);

}  // namespace tonewerk
