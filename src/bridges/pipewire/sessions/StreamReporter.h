// SPDX-License-Identifier: Apache-2.0
#pragma once

#include <chrono>
#include <cstdint>
#include <optional>
#include <string>
#include <vector>

#include "bridges/pipewire/graph/StreamState.h"
#include "bridges/pipewire/sessions/OverloadPacer.h"
#include "bridges/pipewire/sessions/ReporterIdentifiers.h"
#include "bridges/pipewire/sessions/SessionSink.h"
#include "platform/Clock.h"

namespace tonewerk {

// Reports one stream. The session begins when the application is known. Each change of the playback is sent
// as a message. When the stream leaves, a final message is sent and the session ends.
//
//   stream appears   . . . . . . . .  create, configure, start
//   runs             at t0            message {t0, running, volume, device, format}
//   volume moves     t1 t2 t3         message {t3, running, the new volume, ...}
//   pauses           at t4            message {t4, not running, ...}
//   leaves           at t5            message {t5, not running, ..., session_duration}, stop, destroy
//
// Every message holds the whole state, and all have the same category and type. The daemon drops a message
// that repeats the newest one of its category and type. Because each message holds the whole state, the
// daemon drops exactly those that say nothing new. If starts, stops and volumes had types of their own, a
// second start at the old volume would be lost.
//
// Changes that belong together arrive one by one: the running state before the format, the sinks of a move in
// turn, the steps of a drag. So a change is held until kSettleTime has passed without another. A start is
// also held until volume, device and format are known. Both are held for at most kMaxHold. A message carries
// the time of the change: the time of the start for a start, the time of the last step for any other change.
// A pause or an end is sent at once, after a held change.
//
// An overload is sent at once, under a category and type of its own. Later ones are sent at most once a
// second, those of different culprits in different messages.
//
// Used on one thread, which calls deadlineReached() when the time deadline() has come.
class StreamReporter {
 public:
  static constexpr std::chrono::milliseconds kSettleTime{200};
  static constexpr std::chrono::milliseconds kMaxHold{1000};

  // All arguments outlive this object.
  StreamReporter(SessionSink& sink, const Clock& clock, ReporterIdentifiers& identifiers);

  void update(const StreamState& state);
  void overloaded(const Overload& overload);
  // No message has reached a daemon yet: begins a new session with the present state.
  void restart();
  // The session exists, but the messages sent to it are lost: sends the present state again, with the present
  // time.
  void resend();
  // The stream is gone: sends the final message and ends the session. No other call may follow.
  void end();

  // Monotonic time of the next call of deadlineReached(); none when nothing is held.
  std::optional<std::chrono::nanoseconds> deadline() const;
  void deadlineReached();

 private:
  // A message's content without its time.
  struct Playback {
    bool running = false;
    std::optional<double> volume;
    std::optional<AudioFormat> format;
    std::string device;

    bool isComplete() const { return volume && format && !device.empty(); }
    friend bool operator==(const Playback&, const Playback&) = default;
  };
  struct HeldChange {
    double time;  // wall-clock time of the message, in seconds since 1970
    std::chrono::nanoseconds firstStep;
    std::chrono::nanoseconds lastStep;
  };

  std::optional<std::chrono::nanoseconds> changeDeadline() const;
  bool isStart() const { return playback_.running && !(reported_ && reported_->running); }
  void mergeState(const StreamState& state);
  void holdChange();
  void sendHeldChange();
  void sendState(double time);
  void sendOverloads(const std::vector<Overload>& overloads);
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
  Playback playback_;  // the present state; a value that is now unknown keeps its last known value
  std::optional<Playback> reported_;  // the state last sent to the session; none before the first start
  std::optional<HeldChange> held_;
  OverloadPacer overloads_;
};

}  // namespace tonewerk
