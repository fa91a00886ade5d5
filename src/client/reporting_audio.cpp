// SPDX-License-Identifier: Apache-2.0
// Implements the functions that say what a session's audio does. Those of senders run on real-time threads:
// the payloads are built on the stack.
//
// The daemon drops a message that repeats the newest one of its category and type. So each of the session's
// properties has one category and type, and each message has the properties of this category and type only: a
// message is then dropped exactly when it says nothing new.
#include "tonewerk/reporting_audio.h"

#include <algorithm>
#include <charconv>
#include <cmath>
#include <cstring>
#include <ctime>
#include <optional>
#include <string_view>

#include "client/AudioActivity.h"
#include "client/SessionActivity.h"
#include "client/SessionRecord.h"

namespace tonewerk {
namespace {

using Kind = AudioActivity::Kind;

// Reading this clock makes no system call, whatever the clock source is.
AudioActivity::Time coarseNow() {
  timespec now{};
  ::clock_gettime(CLOCK_MONOTONIC_COARSE, &now);
  return std::chrono::seconds(now.tv_sec) +
         std::chrono::duration_cast<AudioActivity::Time>(std::chrono::nanoseconds(now.tv_nsec));
}

// Has room for the texts of every function here.
class AudioPayload {
 public:
  AudioPayload() { twr_payload_init(&payload_, memory_, sizeof(memory_)); }
  AudioPayload(const AudioPayload&) = delete;
  AudioPayload& operator=(const AudioPayload&) = delete;

  twr_payload* get() { return &payload_; }

 private:
  static constexpr std::size_t kTexts = 3;
  static constexpr std::size_t kRoomForKeys = 256;

  unsigned char memory_[kTexts * TWR_MOST_AUDIO_TEXT_BYTES + kRoomForKeys];
  twr_payload payload_;
};

twr_status send(twr_session* session, std::uint32_t category, std::uint16_t type, AudioPayload& payload) {
  return twr_session_send(session, category, type, payload.get(), nullptr, nullptr);
}

twr_status send(twr_sender* sender, std::uint32_t category, std::uint16_t type, AudioPayload& payload) {
  return twr_sender_send(sender, category, type, payload.get());
}

AudioActivity& activityOf(twr_session& session) { return session.activity; }
AudioActivity& activityOf(twr_sender& sender) { return sender.activity; }

bool isVolume(double volume) { return volume >= 0.0 && volume <= 1.0; }

twr_status problemOfText(const char* text) {
  if (text == nullptr || *text == '\0') return TWR_INVALID;
  constexpr std::size_t kMost = TWR_MOST_AUDIO_TEXT_BYTES;
  return ::strnlen(text, kMost + 1) > kMost ? TWR_TOO_LARGE : TWR_OK;
}

std::uint32_t categoryOf(Kind kind) {
  return kind == AudioActivity::kPlaying ? TWR_CATEGORY_PLAYBACK : TWR_CATEGORY_RECORD;
}

const char* keyOf(Kind kind) {
  return kind == AudioActivity::kPlaying ? "session_output_running" : "session_input_running";
}

template <class Target>
twr_status begin(Target& target, Kind kind) {
  AudioActivity& activity = activityOf(target);
  // A start is sent even if it runs already: a daemon that has restarted does not know.
  const bool begins = activity.begin(kind, coarseNow());
  AudioPayload payload;
  twr_put_bool(payload.get(), keyOf(kind), 1);
  const twr_status status = send(&target, categoryOf(kind), TWR_TYPE_STATE, payload);
  if (status != TWR_OK && begins) activity.end(kind, coarseNow());
  return status;
}

template <class Target>
twr_status end(Target* target, Kind kind) {
  if (target == nullptr) return TWR_INVALID;
  AudioActivity& activity = activityOf(*target);
  const AudioActivity::End end = activity.end(kind, coarseNow());
  if (!end.wasRunning) return TWR_OK;
  AudioPayload payload;
  twr_put_bool(payload.get(), keyOf(kind), 0);
  // This key ends playing and recording alike, so it comes with the last end only.
  if (end.seconds) twr_put_double(payload.get(), "session_duration", *end.seconds);
  const twr_status status = send(target, categoryOf(kind), TWR_TYPE_STATE, payload);
  if (status != TWR_OK) activity.resume(kind, end);
  return status;
}

template <class Target>
twr_status setVolume(Target* target, double volume) {
  if (target == nullptr || !isVolume(volume)) return TWR_INVALID;
  AudioPayload payload;
  twr_put_double(payload.get(), "QMSessionVolume", volume);
  return send(target, TWR_CATEGORY_VOLUME, TWR_TYPE_STATE, payload);
}

template <class Target>
twr_status play(Target* target, double volume) {
  // Without a volume there would be no summary, so it comes first.
  const twr_status status = setVolume(target, volume);
  return status == TWR_OK ? begin(*target, AudioActivity::kPlaying) : status;
}

template <class Target>
twr_status record(Target* target) {
  return target == nullptr ? TWR_INVALID : begin(*target, AudioActivity::kRecording);
}

template <class Target>
twr_status setDevice(Target* target, const char* device, std::optional<const char*> reason) {
  if (target == nullptr) return TWR_INVALID;
  if (const twr_status problem = problemOfText(device); problem != TWR_OK) return problem;
  AudioPayload payload;
  twr_put_text(payload.get(), "active_devices", device);
  if (reason) {
    if (const twr_status problem = problemOfText(*reason); problem != TWR_OK) return problem;
    twr_put_text(payload.get(), "reason", *reason);
  }
  if (const twr_status problem = twr_payload_problem(payload.get()); problem != TWR_OK) return problem;
  return send(target, TWR_CATEGORY_ROUTE_CHANGE, TWR_TYPE_STATE, payload);
}

// Writes pieces of a text into memory that is large enough.
class TextPieces {
 public:
  void add(std::string_view text) {
    std::memcpy(at_, text.data(), text.size());
    at_ += text.size();
  }
  void add(std::uint32_t number) { at_ = std::to_chars(at_, bytes_ + sizeof(bytes_), number).ptr; }

  std::string_view text() const { return {bytes_, static_cast<std::size_t>(at_ - bytes_)}; }

 private:
  static constexpr std::size_t kRoomForNumbers = 64;

  char bytes_[TWR_MOST_AUDIO_TEXT_BYTES + kRoomForNumbers];
  char* at_ = bytes_;
};

template <class Target>
twr_status setFormat(Target* target, std::uint32_t sampleRate, std::uint32_t channels, const char* coding) {
  if (target == nullptr || sampleRate == 0 || channels == 0) return TWR_INVALID;
  if (const twr_status problem = problemOfText(coding); problem != TWR_OK) return problem;
  TextPieces format;  // as "48000 Hz, 2 ch, lpcm"
  format.add(sampleRate);
  format.add(" Hz, ");
  format.add(channels);
  format.add(" ch, ");
  format.add(std::string_view(coding));
  AudioPayload payload;
  twr_put_text_n(payload.get(), "session_selected_format", format.text().data(), format.text().size());
  twr_put_text(payload.get(), "mFormatID", coding);
  twr_put_uint(payload.get(), "mChannelsPerFrame", channels);
  if (const twr_status problem = twr_payload_problem(payload.get()); problem != TWR_OK) return problem;
  return send(target, TWR_CATEGORY_SETUP, TWR_TYPE_STATE, payload);
}

template <class Target>
twr_status overload(Target* target, const twr_overload* given) {
  if (target == nullptr) return TWR_INVALID;
  twr_overload known{};
  // A caller that was built with an older version knows fewer members.
  if (given != nullptr) std::memcpy(&known, given, std::min(given->size, sizeof(known)));
  if (!(known.silence_seconds >= 0.0) || std::isinf(known.silence_seconds)) return TWR_INVALID;
  AudioPayload payload;
  twr_put_text(payload.get(), "issue_type", "overload");
  if (known.node != nullptr && *known.node != '\0') {
    if (const twr_status problem = problemOfText(known.node); problem != TWR_OK) return problem;
    twr_put_text(payload.get(), "node", known.node);
  }
  if (known.silence_seconds > 0.0)
    twr_put_double(payload.get(), "any_channel_silence_seconds", known.silence_seconds);
  if (known.buffer_frames > 0) twr_put_uint(payload.get(), "smallest_buffer_frame_size", known.buffer_frames);
  if (known.io_cycle > 0) twr_put_uint(payload.get(), "io_cycle", known.io_cycle);
  if (const twr_status problem = twr_payload_problem(payload.get()); problem != TWR_OK) return problem;
  return send(target, TWR_CATEGORY_IO, TWR_TYPE_ERROR, payload);
}

}  // namespace

void endActivity(twr_session& session) {
  static_cast<void>(end(&session, AudioActivity::kPlaying));
  static_cast<void>(end(&session, AudioActivity::kRecording));
}

}  // namespace tonewerk

using tonewerk::AudioActivity;

twr_status twr_session_application(twr_session* session, const char* application) {
  if (session == nullptr) return TWR_INVALID;
  if (const twr_status problem = tonewerk::problemOfText(application); problem != TWR_OK) return problem;
  tonewerk::AudioPayload configuration;
  twr_put_text(configuration.get(), "HostApplicationDisplayID", application);
  return twr_session_set_configuration(session, configuration.get(), nullptr, nullptr);
}

twr_status twr_session_playing(twr_session* session, double volume) {
  return tonewerk::play(session, volume);
}
twr_status twr_sender_playing(twr_sender* sender, double volume) { return tonewerk::play(sender, volume); }

twr_status twr_session_playing_stopped(twr_session* session) {
  return tonewerk::end(session, AudioActivity::kPlaying);
}
twr_status twr_sender_playing_stopped(twr_sender* sender) {
  return tonewerk::end(sender, AudioActivity::kPlaying);
}

twr_status twr_session_recording(twr_session* session) { return tonewerk::record(session); }
twr_status twr_sender_recording(twr_sender* sender) { return tonewerk::record(sender); }

twr_status twr_session_recording_stopped(twr_session* session) {
  return tonewerk::end(session, AudioActivity::kRecording);
}
twr_status twr_sender_recording_stopped(twr_sender* sender) {
  return tonewerk::end(sender, AudioActivity::kRecording);
}

twr_status twr_session_volume(twr_session* session, double volume) {
  return tonewerk::setVolume(session, volume);
}
twr_status twr_sender_volume(twr_sender* sender, double volume) {
  return tonewerk::setVolume(sender, volume);
}

twr_status twr_session_device(twr_session* session, const char* device) {
  return tonewerk::setDevice(session, device, std::nullopt);
}
twr_status twr_sender_device(twr_sender* sender, const char* device) {
  return tonewerk::setDevice(sender, device, std::nullopt);
}

twr_status twr_session_route(twr_session* session, const char* device, const char* reason) {
  return tonewerk::setDevice(session, device, reason);
}
twr_status twr_sender_route(twr_sender* sender, const char* device, const char* reason) {
  return tonewerk::setDevice(sender, device, reason);
}

twr_status twr_session_format(twr_session* session, uint32_t sampleRate, uint32_t channels,
                              const char* coding) {
  return tonewerk::setFormat(session, sampleRate, channels, coding);
}
twr_status twr_sender_format(twr_sender* sender, uint32_t sampleRate, uint32_t channels, const char* coding) {
  return tonewerk::setFormat(sender, sampleRate, channels, coding);
}

twr_status twr_session_overload(twr_session* session, const twr_overload* overload) {
  return tonewerk::overload(session, overload);
}
twr_status twr_sender_overload(twr_sender* sender, const twr_overload* overload) {
  return tonewerk::overload(sender, overload);
}
