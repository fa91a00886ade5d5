// SPDX-License-Identifier: Apache-2.0
#include "ClientMessages.h"

#include <algorithm>
#include <array>
#include <chrono>
#include <initializer_list>
#include <numeric>
#include <random>
#include <string_view>
#include <vector>

#include "values/Value.h"

namespace tonewerk {
namespace {

constexpr std::uint32_t kSeed = 20'251'120;

// Which messages of a kind change, repeatedly. The first one must, so that it also differs from the last one.
constexpr std::array kChanges{true, true, false, true, false};

// An entry whose value changes takes it from the message's state.
struct Entry {
  std::string_view key;
  Value fixed;
  bool changes = false;
};

struct MessageKind {
  std::uint32_t category;
  std::uint16_t type;
  std::vector<Entry> entries;
};

constexpr std::string_view kFormat = "48000 Hz, 2 ch, Float32";

// No two have the same category and type: a message is compared with the newest one of its category and type.
const std::vector<MessageKind>& messageKinds() {
  static const std::vector<MessageKind> all{
      {4,
       0,
       {{"position", Value(), true},
        {"running", Value(true)},
        {"stream_format", Value(kFormat)},
        {"active_device", Value("Speaker")},
        {"codec_name", Value("lpcm")},
        {"channel_count", Value(2)},
        {"output_volume", Value(0.4375)},
        {"output_muted", Value(false)},
        {"latency_us", Value(5333)},
        {"buffers", Value(3)}}},
      {4,
       3,
       {{"session_active", Value(true)},
        {"position", Value(), true},
        {"active_device", Value("Headphones")},
        {"current_route", Value("Wired")},
        {"stream_identifier", Value(417)},
        {"nominal_sample_rate", Value(44'100.0)},
        {"frames", Value(), true},
        {"offload", Value(false)},
        {"priority", Value(5)},
        {"usage", Value("media")},
        {"content", Value("music")}}},
      {4,
       4,
       {{"session_active", Value(false)},
        {"position", Value(), true},
        {"active_device", Value("Speaker")},
        {"change_reason", Value("paused by the user")},
        {"played_seconds", Value(183.75)},
        {"underrun_count", Value(0)},
        {"focus", Value("lost for a moment, then regained")},
        {"stream", Value("music")}}},
      {5,
       0,
       {{"output_level", Value(), true},
        {"session_output_running", Value(true)},
        {"active_devices", Value("Speaker")},
        {"io_buffer", Value(512)},
        {"nominal_sample_rate", Value(48'000.0)},
        {"hardware_volume", Value(0.625)},
        {"limiter", Value(true)},
        {"applied_gain_db", Value(-3.5)}}},
      {3,
       0,
       {{"input_level", Value(), true},
        {"session_input_running", Value(true)},
        {"active_inputs", Value("Microphone")},
        {"nominal_sample_rate", Value(16'000.0)},
        {"channel_count", Value(1)},
        {"applied_gain_db", Value(12.0)},
        {"echo_cancelled", Value(true)},
        {"beam_count", Value(2)}}},
      {3,
       3,
       {{"session_active", Value(true)},
        {"frames", Value(), true},
        {"active_device", Value("Microphone array")},
        {"source", Value("voice")},
        {"stream_identifier", Value(23)},
        {"noise_floor_db", Value(-61.5)},
        {"suppression", Value(2)},
        {"wake_word", Value(false)},
        {"privacy", Value(true)},
        {"clipped_frames", Value(0)}}},
      {7,
       0,
       {{"cycle", Value(), true},
        {"io_buffer_frames", Value(256)},
        {"safety", Value(64)},
        {"cycle_load", Value(), true},
        {"late_cycles", Value(0)},
        {"is_overloaded", Value(false)},
        {"clock", Value("device")},
        {"rate", Value(48'000.0)},
        {"node_name", Value("alsa_output.0")},
        {"period", Value(5'333)},
        {"jitter", Value(17)},
        {"threads", Value(2)},
        {"streams", Value(4)}}},
      {10,
       0,
       {{"current_route", Value("Bluetooth")},
        {"changes", Value(), true},
        {"previous_route", Value("Speaker")},
        {"change_reason", Value("a device was connected")},
        {"device_address", Value("00:1a:7d:da:71:13")},
        {"codec_name", Value("ldac")},
        {"bit_rate", Value(909'000)}}},
      {10,
       3,
       {{"current_route", Value("Speaker")},
        {"changes", Value(), true},
        {"previous_route", Value("Wired")},
        {"change_reason", Value("a device was removed")},
        {"duration_ms", Value(87.5)},
        {"glitch_count", Value(0)},
        {"resumed", Value(true)},
        {"category_mode", Value("default")}}},
      {13,
       0,
       {{"cpu_load", Value(), true},
        {"wakeups", Value(), true},
        {"voice_count", Value(3)},
        {"graph_nodes", Value(14)},
        {"dropped_frames", Value(0)},
        {"resampled", Value(1)},
        {"die_temperature", Value(41.5)},
        {"routing_mode", Value("low power")},
        {"cluster", Value(1)},
        {"boosted", Value(false)},
        {"governor", Value("schedutil")},
        {"frequency", Value(1'804'800)}}},
      {13,
       3,
       {{"latency_us", Value(), true},
        {"queued_buffers", Value(2)},
        {"mixed", Value(true)},
        {"plugin_count", Value(6)},
        {"dsp_us", Value(812)},
        {"effects", Value("equalizer,limiter")},
        {"spatial_audio", Value(false)},
        {"head_tracking", Value(false)},
        {"quality", Value(7)},
        {"blocks", Value(128)},
        {"bypass", Value(false)}}},
      {14,
       0,
       {{"QMSessionVolume", Value(), true},
        {"category_volume", Value(0.75)},
        {"output_muted", Value(false)},
        {"active_devices", Value("Speaker")},
        {"routing_mode", Value("default")},
        {"step", Value(9)},
        {"ringer", Value(true)},
        {"is_ducked", Value(false)},
        {"loudness", Value(-23.5)},
        {"volume_limit", Value(0.85)},
        {"source", Value("buttons")},
        {"ramp", Value(40)},
        {"curve", Value(2)},
        {"fade", Value(false)}}},
  };
  return all;
}

// The daemon replaces times that are days old.
double now() {
  return std::chrono::duration<double>(std::chrono::system_clock::now().time_since_epoch()).count();
}

ValueMap payloadOf(const MessageKind& shape, std::int64_t state, double time) {
  ValueMap payload{{IngestMessages::kTimeKey, Value(time)}};
  for (const Entry& entry : shape.entries) {
    // Counters take three bytes, as they do after a while.
    payload.set(entry.key, entry.changes ? Value(1'000 + state % 60'000) : entry.fixed);
  }
  return payload;
}

}  // namespace

void eachClientMessage(const ClientMessagePlan& plan,
                       const std::function<void(const IngestMessages::Address& address,
                                                const ValueMap& payload, bool isStored)>& take) {
  constexpr std::size_t kKinds = 2;  // of a session
  static_assert(kClientMessageRounds == kKinds * kChanges.size());
  std::mt19937 random(kSeed);
  std::vector<std::size_t> order(plan.sessions);
  std::iota(order.begin(), order.end(), std::size_t{0});
  // The state of a kind is the same in all sessions, because all have had as many messages.
  std::int64_t state = 0;
  double time = now();
  for (std::size_t round = 0; round < plan.rounds; ++round) {
    std::shuffle(order.begin(), order.end(), random);
    const std::size_t kind = round % kKinds;
    const bool isStored = plan.allChange || kChanges[round / kKinds % kChanges.size()];
    if (isStored && (kind == 0 || plan.allChange)) ++state;
    for (const std::size_t session : order) {
      const MessageKind& shape = messageKinds()[(session * kKinds + kind) % messageKinds().size()];
      time += 0.02;
      take({plan.firstReporterID + static_cast<std::int64_t>(session), shape.category, shape.type},
           payloadOf(shape, state, time), isStored);
    }
  }
}

IngestMessages clientMessages(const ClientMessagePlan& plan) {
  IngestMessages messages;
  eachClientMessage(plan, [&](const IngestMessages::Address& address, const ValueMap& payload,
                              bool isStored) { messages.add(address, payload, isStored); });
  return messages;
}

}  // namespace tonewerk
