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

// What a frame holds next to a payload's bytes, at most, with its reporter identifiers not counted.
inline constexpr std::size_t kMessageFrameBytes = 128;
inline constexpr std::size_t kReporterIDBytes = 9;

// Whether a payload of that size makes a frame that the daemon takes.
constexpr bool fitsMessageFrame(std::size_t payloadBytes, std::size_t reporterIDs) {
  constexpr std::size_t kRoom = kMaxFrameBytes - kMessageFrameBytes;
  return reporterIDs <= kRoom / kReporterIDBytes && payloadBytes <= kRoom - reporterIDs * kReporterIDBytes;
}

// Appends a "sendMessage" frame: a request, or without an identifier a notification. To the payload's own
// entries come "twreporting_timestamp", unless one of them is called so, and "twreporting_dropped" where
// some were that nobody has told of. Without reporter identifiers the message is for every started session.
// Where in `out` the payload's own entries begin.
std::size_t appendMessageFrame(std::string& out, std::optional<std::uint32_t> requestIdentifier,
                               const RingMessage& message, std::uint64_t dropped,
                               std::span<const std::int64_t> reporterIDs);

}  // namespace tonewerk
