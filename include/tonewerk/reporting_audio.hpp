// SPDX-License-Identifier: Apache-2.0
#ifndef TONEWERK_REPORTING_AUDIO_HPP
#define TONEWERK_REPORTING_AUDIO_HPP

// Wraps tonewerk/reporting_audio.h for C++17 and later: says what a session's audio does, without keys. See
// there for what is not described here.
//
//   namespace tr = tonewerk::reporting;
//   tr::setApplication(session, "org.example.Player");
//   session.start();
//   tr::reportDevice(session, "Speaker");
//   tr::reportFormat(session, 48000, 2, "lpcm");
//   {
//     tr::Playing playing(session, 0.5);
//     ...
//     playing.setVolume(0.3);
//     ...
//   }  // it has stopped
//
// `target` is a Session, on any thread, or a Sender, on its thread, which may be a real-time one: the
// functions and objects here then take no lock, allocate nothing and make no system call. Nothing throws.

#include <cstdint>
#include <memory>
#include <tonewerk/reporting.hpp>
#include <tonewerk/reporting_audio.h>
#include <utility>

namespace tonewerk {
namespace reporting {

// The name of the application in the session's reports. Before the start; not on real-time threads.
inline Status setApplication(Session& session, const char* application) noexcept {
  return static_cast<Status>(::twr_session_application(session.get(), application));
}

inline Status reportVolume(Session& target, double volume) noexcept {
  return static_cast<Status>(::twr_session_volume(target.get(), volume));
}
inline Status reportVolume(Sender& target, double volume) noexcept {
  return static_cast<Status>(::twr_sender_volume(target.get(), volume));
}

inline Status reportDevice(Session& target, const char* device) noexcept {
  return static_cast<Status>(::twr_session_device(target.get(), device));
}
inline Status reportDevice(Sender& target, const char* device) noexcept {
  return static_cast<Status>(::twr_sender_device(target.get(), device));
}

inline Status reportRoute(Session& target, const char* device, const char* reason) noexcept {
  return static_cast<Status>(::twr_session_route(target.get(), device, reason));
}
inline Status reportRoute(Sender& target, const char* device, const char* reason) noexcept {
  return static_cast<Status>(::twr_sender_route(target.get(), device, reason));
}

inline Status reportFormat(Session& target, std::uint32_t sampleRate, std::uint32_t channels,
                           const char* coding) noexcept {
  return static_cast<Status>(::twr_session_format(target.get(), sampleRate, channels, coding));
}
inline Status reportFormat(Sender& target, std::uint32_t sampleRate, std::uint32_t channels,
                           const char* coding) noexcept {
  return static_cast<Status>(::twr_sender_format(target.get(), sampleRate, channels, coding));
}

// What is known of an overload; the members that stay as they are, are not known.
struct AudioOverload {
  const char* node = nullptr;
  double silenceSeconds = 0;
  std::uint32_t bufferFrames = 0;
  std::uint64_t ioCycle = 0;
};

namespace detail {

inline twr_overload overloadOf(const AudioOverload& known) noexcept {
  twr_overload overload{};
  overload.size = sizeof(overload);
  overload.node = known.node;
  overload.silence_seconds = known.silenceSeconds;
  overload.buffer_frames = known.bufferFrames;
  overload.io_cycle = known.ioCycle;
  return overload;
}

}  // namespace detail

inline Status reportOverload(Session& target, const AudioOverload& known = {}) noexcept {
  const twr_overload overload = detail::overloadOf(known);
  return static_cast<Status>(::twr_session_overload(target.get(), &overload));
}
inline Status reportOverload(Sender& target, const AudioOverload& known = {}) noexcept {
  const twr_overload overload = detail::overloadOf(known);
  return static_cast<Status>(::twr_sender_overload(target.get(), &overload));
}

// The common part of Playing and RecordingInput. It can be moved but not copied.
//
// Made with a Session, it keeps the session alive. Made with a Sender, it must be destroyed before the
// sender, on the sender's thread.
class AudioUse {
 public:
  AudioUse(const AudioUse&) = delete;
  AudioUse& operator=(const AudioUse&) = delete;

  // Whether it has begun: false when the message could not be queued, after stop(), and when moved from.
  explicit operator bool() const noexcept { return session_ != nullptr || sender_ != nullptr; }
  // Why it has not begun; kOk when it has.
  Status status() const noexcept { return status_; }

 protected:
  AudioUse(Session& target, twr_status begun) noexcept : status_(static_cast<Status>(begun)) {
    if (begun == TWR_OK) session_ = target.handle_;
  }
  AudioUse(Sender& target, twr_status begun) noexcept : status_(static_cast<Status>(begun)) {
    if (begun == TWR_OK) sender_ = target.get();
  }
  AudioUse(AudioUse&& other) noexcept
      : session_(std::move(other.session_)),
        sender_(std::exchange(other.sender_, nullptr)),
        status_(other.status_) {
    other.session_.reset();
  }
  ~AudioUse() = default;

  twr_session* session() const noexcept { return session_ ? session_->session : nullptr; }
  twr_sender* sender() const noexcept { return sender_; }

  template <class OfSession, class OfSender>
  Status call(OfSession ofSession, OfSender ofSender) const noexcept {
    if (sender_ != nullptr) return static_cast<Status>(ofSender(sender_));
    return static_cast<Status>(ofSession(session()));
  }
  template <class OfSession, class OfSender>
  Status end(OfSession ofSession, OfSender ofSender) noexcept {
    if (!*this) return Status::kInvalid;
    const Status status = call(ofSession, ofSender);
    if (status == Status::kOk) {
      session_.reset();
      sender_ = nullptr;
    }
    return status;
  }
  void take(AudioUse& other) noexcept {
    session_ = std::move(other.session_);
    other.session_.reset();
    sender_ = std::exchange(other.sender_, nullptr);
    status_ = other.status_;
  }

 private:
  std::shared_ptr<detail::SessionHandle> session_;
  twr_sender* sender_ = nullptr;
  Status status_;
};

// The session plays as long as this object exists. For each session one at a time.
class Playing : public AudioUse {
 public:
  // `volume` is from 0 to 1; a program without a volume of its own passes 1.
  explicit Playing(Session& target, double volume) noexcept
      : AudioUse(target, ::twr_session_playing(target.get(), volume)) {}
  explicit Playing(Sender& target, double volume) noexcept
      : AudioUse(target, ::twr_sender_playing(target.get(), volume)) {}
  Playing(Playing&& other) noexcept = default;
  Playing& operator=(Playing&& other) noexcept {
    if (this != &other) {
      stop();
      take(other);
    }
    return *this;
  }
  ~Playing() { stop(); }

  Status setVolume(double volume) noexcept {
    return call([&](twr_session* session) { return ::twr_session_volume(session, volume); },
                [&](twr_sender* sender) { return ::twr_sender_volume(sender, volume); });
  }
  // Ends it before the object does. Status::kInvalid when it does not play. After a failure it may be tried
  // again.
  Status stop() noexcept { return end(&::twr_session_playing_stopped, &::twr_sender_playing_stopped); }
};

// The session records as long as this object exists. For each session one at a time.
class RecordingInput : public AudioUse {
 public:
  explicit RecordingInput(Session& target) noexcept
      : AudioUse(target, ::twr_session_recording(target.get())) {}
  explicit RecordingInput(Sender& target) noexcept : AudioUse(target, ::twr_sender_recording(target.get())) {}
  RecordingInput(RecordingInput&& other) noexcept = default;
  RecordingInput& operator=(RecordingInput&& other) noexcept {
    if (this != &other) {
      stop();
      take(other);
    }
    return *this;
  }
  ~RecordingInput() { stop(); }

  // As Playing::stop().
  Status stop() noexcept { return end(&::twr_session_recording_stopped, &::twr_sender_recording_stopped); }
};

}  // namespace reporting
}  // namespace tonewerk

#endif  // TONEWERK_REPORTING_AUDIO_HPP
