// SPDX-License-Identifier: Apache-2.0
#pragma once

#include <chrono>
#include <cstdint>
#include <optional>
#include <string>

#include "bridges/pipewire/graph/StreamState.h"
#include "bridges/pipewire/sessions/OverloadPacer.h"
#include "bridges/pipewire/sessions/ReporterIdentifiers.h"
#include "bridges/pipewire/sessions/SessionSink.h"
#include "platform/Clock.h"

namespace tonewerk {

// Reports one stream: a session that begins when it is known who plays, a message whenever something about
// the playback has changed, a final message and the session's end when the stream leaves.
//
//   stream appears   . . . . . . . .  create, configure, start
//   runs             at t0            message {t0, running, volume, device, format}
//   volume moves     t1 t2 t3         message {t3, running, the new volume, ...}
//   pauses           at t4            message {t4, not running, ...}
//   leaves           at t5            message {t5, not running, ..., session_duration}, stop, destroy
//
// Every message is the whole state under one category and type. The daemon drops a message that repeats the
// newest of its category and type; with the whole state in each, what it drops is exactly what says nothing
// new. Were starts, stops and volumes told under types of their own, a second start at the old volume would
// be lost.
//
// What belongs together arrives apart: the state before the format, the sinks of a move one by one, a drag in
// steps. A change is therefore held until kSettleTime has passed without another, a start also until volume,
// device and format are known, both at most kLongestHold. It is told with the time at which it happened: a
// start that of the start, any other the time of its last step. A pause or an end is told at once, after what
// was held.
//
// An overload is told at once, under a category and type of its own; more of them once in a second.
//
// For one thread, on which deadlineReached() is called when deadline() has come.
class StreamReporter {
 public:
  static constexpr std::chrono::milliseconds kSettleTime{200};
  static constexpr std::chrono::milliseconds kLongestHold{1000};

  // All outlive this.
  StreamReporter(SessionSink& sink, const Clock& clock, ReporterIdentifiers& identifiers);

  void update(const StreamState& state);
  void overloaded(const Overload& overload);
  // Nothing said so far has reached a daemon: a new session from the present state.
  void restart();
  // The session is there, but what it was told is lost: the present state again, told as it is now.
  void retell();
  // The stream is gone. The last call.
  void end();

  // Monotonic time; none when nothing is held.
  std::optional<std::chrono::nanoseconds> deadline() const;
  void deadlineReached();

 private:
  // What a message says besides its time.
  struct Playback {
    bool running = false;
    std::optional<double> volume;
    std::optional<AudioFormat> format;
    std::string device;

    bool isComplete() const { return volume && format && !device.empty(); }
    friend bool operator==(const Playback&, const Playback&) = default;
  };
  struct HeldChange {
    double time;  // wall-clock time for its message
    std::chrono::nanoseconds firstStep;
    std::chrono::nanoseconds lastStep;
  };

  std::optional<std::chrono::nanoseconds> changeDeadline() const;
  bool isStart() const { return playback_.running && !(told_ && told_->running); }
  void take(const StreamState& state);
  void hold();
  void tellHeld();
  void tell(double time);
  void tellOverload(const std::optional<Overload>& overload);
  void beginSession();
  ValueMap messageFor(double time) const;

  SessionSink& sink_;
  const Clock& clock_;
  ReporterIdentifiers& identifiers_;

  std::chrono::nanoseconds appearedAt_;
  std::int64_t reporterID_ = 0;  // 0 until the session has begun
  bool described_ = false;
  std::string application_;
  std::string role_;
  Playback playback_;             // as it is, with what was last known of it
  std::optional<Playback> told_;  // as the session last heard it; none before the first start
  std::optional<HeldChange> held_;
  OverloadPacer overloads_;
};

}  // namespace tonewerk
