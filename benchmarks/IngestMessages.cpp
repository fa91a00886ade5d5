// SPDX-License-Identifier: Apache-2.0
#include "IngestMessages.h"

#include <bit>
#include <chrono>
#include <cstring>
#include <endian.h>
#include <string_view>
#include <vector>

#include "platform/linux/messagepack/RpcWriter.h"
#include "support/client/ReportingClient.h"

namespace tonewerk {
namespace {

constexpr std::uint32_t kPlayback = 4;
constexpr std::uint16_t kGeneric = 0;
constexpr double kStep = 0.02;  // seconds between messages

double now() {
  return std::chrono::duration<double>(std::chrono::system_clock::now().time_since_epoch()).count();
}

// Describes a playing stream with values of the types that clients send.
ValueMap payloadOf(std::int64_t position, double time) {
  return {{IngestMessages::kTimeKey, time},
          {"session_output_running", true},
          {"session_selected_format", "48000 Hz, 2 ch, Float32, interleaved"},
          {"active_devices", "Speaker"},
          {"mFormatID", "lpcm"},
          {"mChannelsPerFrame", 2},
          {"QMSessionVolume", 0.4375},
          {"position", position}};
}

void writeStart(RpcWriter& writer, const Value& session, std::int64_t serviceType) {
  writer.notification("createReportingSession", {session});
  writer.notification("setServiceType", {Value(serviceType), session});
  writer.notification("startReportingSessionForID", {session});
}

}  // namespace

IngestMessages IngestMessages::playback(Kind kind, std::int64_t reporterID, std::size_t count) {
  IngestMessages messages;
  const double start = now();
  for (std::size_t at = 0; at < count; ++at) {
    const std::int64_t position = kind == Kind::kChanging ? static_cast<std::int64_t>(at) : 0;
    const double time = start + static_cast<double>(at) * kStep;
    messages.add({reporterID, kPlayback, kGeneric}, payloadOf(position, time), kind == Kind::kChanging);
  }
  return messages;
}

IngestMessages IngestMessages::lives(std::int64_t firstReporterID, std::size_t sessions,
                                     std::int64_t serviceType) {
  IngestMessages lives;
  for (std::size_t at = 0; at < sessions; ++at) {
    const Value session(firstReporterID + static_cast<std::int64_t>(at));
    const std::uint32_t identifier = lives.nextIdentifier();
    RpcWriter writer(lives.bytes_);
    writeStart(writer, session, serviceType);
    writer.notification("stopReportingSessionForID", {session});
    writer.request(identifier, "destroyReportingSession", {session});
    lives.end(false);
  }
  return lives;
}

std::string IngestMessages::opening(std::int64_t reporterID, std::int64_t serviceType) {
  std::string bytes;
  RpcWriter writer(bytes);
  const Value session(reporterID);
  writeStart(writer, session, serviceType);
  writer.request(kFirstIdentifier, "setConfiguration",
                 {Value(ValueMap{{"HostApplicationDisplayID", "com.example.player"}}), session});
  return bytes;
}

std::string IngestMessages::closing(std::int64_t reporterID) {
  std::string bytes;
  RpcWriter(bytes).request(kFirstIdentifier, "stopReportingSessionForID", {Value(reporterID)});
  return bytes;
}

void IngestMessages::add(const Address& address, const ValueMap& payload, bool isStored) {
  const std::size_t start = bytes_.size();
  RpcWriter(bytes_).request(
      nextIdentifier(), "sendMessage",
      ReportingClient::messageArguments(payload, address.category, address.type, {address.reporterID}));
  const std::size_t key = bytes_.find(kTimeKey, start);
  if (key != std::string::npos) times_.push_back(key + kTimeKey.size() + 1);  // after the byte of the format
  end(isStored);
}

void IngestMessages::advanceTimes() {
  if (times_.empty()) return;
  const double more = timeAt(times_.back()) - timeAt(times_.front()) + kStep;
  for (const std::size_t place : times_) {
    const std::uint64_t bits = htobe64(std::bit_cast<std::uint64_t>(timeAt(place) + more));
    std::memcpy(bytes_.data() + place, &bits, sizeof(bits));
  }
}

double IngestMessages::timeAt(std::size_t place) const {
  std::uint64_t bits = 0;
  std::memcpy(&bits, bytes_.data() + place, sizeof(bits));
  return std::bit_cast<double>(be64toh(bits));
}

void IngestMessages::end(bool isStored) {
  ends_.push_back(bytes_.size());
  stored_.push_back(storedOfFirst(stored_.size()) + (isStored ? 1 : 0));
}

}  // namespace tonewerk
