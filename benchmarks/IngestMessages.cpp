// SPDX-License-Identifier: Apache-2.0
#include "IngestMessages.h"

#include <chrono>
#include <string_view>
#include <vector>

#include "platform/linux/messagepack/RpcWriter.h"
#include "support/client/ReportingClient.h"

namespace tonewerk {
namespace {

constexpr std::uint32_t kPlayback = 4;
constexpr std::uint16_t kGeneric = 0;

double now() {
  return std::chrono::duration<double>(std::chrono::system_clock::now().time_since_epoch()).count();
}

// Describes a playing stream with values of the types that clients send.
ValueMap payloadOf(std::int64_t position, double time) {
  return {{"twreporting_timestamp", time},
          {"session_output_running", true},
          {"session_selected_format", "48000 Hz, 2 ch, Float32, interleaved"},
          {"active_devices", "Speaker"},
          {"mFormatID", "lpcm"},
          {"mChannelsPerFrame", 2},
          {"QMSessionVolume", 0.4375},
          {"position", position}};
}

}  // namespace

IngestMessages::IngestMessages(Kind kind, std::int64_t reporterID, std::size_t count) : count_(count) {
  RpcWriter writer(bytes_);
  const double start = now();
  for (std::size_t at = 0; at < count; ++at) {
    const std::int64_t position = kind == Kind::kChanging ? static_cast<std::int64_t>(at) : 0;
    const double time = start + static_cast<double>(at) * 0.02;
    writer.request(
        kFirstIdentifier + static_cast<std::uint32_t>(at), "sendMessage",
        ReportingClient::messageArguments(payloadOf(position, time), kPlayback, kGeneric, {reporterID}));
    ends_.push_back(bytes_.size());
  }
}

std::string IngestMessages::opening(std::int64_t reporterID, std::int64_t serviceType) {
  std::string bytes;
  RpcWriter writer(bytes);
  const Value session(reporterID);
  writer.notification("createReportingSession", {session});
  writer.notification("setServiceType", {Value(serviceType), session});
  writer.notification("startReportingSessionForID", {session});
  writer.request(kFirstIdentifier, "setConfiguration",
                 {Value(ValueMap{{"HostApplicationDisplayID", "com.example.player"}}), session});
  return bytes;
}

std::string IngestMessages::closing(std::int64_t reporterID) {
  std::string bytes;
  RpcWriter(bytes).request(kFirstIdentifier, "stopReportingSessionForID", {Value(reporterID)});
  return bytes;
}

}  // namespace tonewerk
