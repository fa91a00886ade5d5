// SPDX-License-Identifier: Apache-2.0
#pragma once

#include <cstddef>
#include <cstdint>
#include <optional>
#include <span>
#include <string_view>

#include "protocol/AudioEvent.h"
#include "values/Value.h"
#include "values/ValueView.h"

namespace tonewerk {

class TWReportingSession;
class TWReportingSessionMessage;
struct SessionBeginning;
struct SessionEnd;

// Learns why the core does what it does with a session's messages: the rules themselves tell it while they
// run. A daemon has none, so a rule costs it one branch; `twctl` plays a session again with one.
//
//   lifeBegan -> messageArrived ... -> stopping -> { walkBegan -> messageMerged ...
//                                                    stretchBegan -> stretchEnded ... -> walkEnded }
//                                               -> messageArrived (the summaries) ... -> lifeEnded
//
// Called on the work queue. What is passed is valid during the call. A message that a session keeps stays at
// its address until stopping() of that session, and then again until lifeEnded().
class ReasonTrace {
 public:
  virtual ~ReasonTrace() = default;

  // Null when nobody listens.
  static ReasonTrace* current() { return current_; }

  // Makes a trace the current one. Made before the context, while no thread uses the core, and destroyed
  // after it. The trace outlives it.
  class Scope {
   public:
    explicit Scope(ReasonTrace& trace) { current_ = &trace; }
    Scope(const Scope&) = delete;
    Scope& operator=(const Scope&) = delete;
    ~Scope() { current_ = nullptr; }
  };

  virtual void lifeBegan(const TWReportingSession& session, const SessionBeginning& beginning) = 0;
  // Also for a life that began when its session was not started yet, and that never was.
  virtual void lifeEnded(const TWReportingSession& session, const SessionEnd& end) = 0;

  // A message has been completed, judged and delivered, or one of the session itself was added.
  struct Arrival {
    const TWReportingSessionMessage& message;
    // The session's copy; null for a redundant message, and for one that it has no room for.
    const TWReportingSessionMessage* kept = nullptr;
    // The kept message that a redundant one repeats.
    const TWReportingSessionMessage* repeated = nullptr;
  };
  virtual void messageArrived(const TWReportingSession& session, const Arrival& arrival) = 0;

  // The session stops. Its messages are in the order of their times now. The walks that follow are over them.
  virtual void stopping(const TWReportingSession& session) = 0;

  // A producer looks for stretches.
  struct Walk {
    AudioEventCategory category = 0;  // of the summaries
    std::string_view runningKey;      // says that output or input runs
    double minimumSeconds = 0.0;      // a stretch of this length or less gives no summary
    // Whether the session's latest values say that output or input runs. The walk begins with them.
    bool runsBefore = false;
    // Their time, if the stretch that is then running counts from there; in seconds since 1970.
    std::optional<double> since;
  };
  virtual void walkBegan(const Walk& walk) = 0;

  // A message was `pause` seconds after `into`. It was merged into it if that is less than `maximum`.
  struct Merge {
    const ValueMap& into;
    const ValueMap& message;
    double pause = 0.0;
    double maximum = 0.0;
    bool isMerged = false;
  };
  virtual void rapidMessage(const Merge& merge) = 0;

  // A message says that output or input runs now. It begins a stretch unless the producer's own condition,
  // about the key `condition`, is not met.
  struct Begin {
    const ValueMap& message;
    std::optional<double> at;    // in seconds since 1970
    std::string_view condition;  // empty when a stretch begins
  };
  virtual void stretchBegan(const Begin& begin) = 0;

  enum class Cause {
    kStopped,  // output or input stopped
    kLast,     // the client's last message, which has the session's duration
    kChanged,  // a value changed
  };
  enum class Outcome {
    kSummary,
    kTooShort,
    kNoBegin,        // when it began is not known, or what began did not count
    kNoEnd,          // the message that ended it has no time
    kNoApplication,  // no application
    kNoVolume,       // no message said the volume
    kNotInGather,    // no message said whether it is in a Gather session
  };
  struct End {
    const ValueMap& message;  // that ended it
    Cause cause = Cause::kStopped;
    std::string_view key = {};  // of kChanged
    ValueView before = {};      // of kChanged; each none where there was no value
    ValueView after = {};
    std::optional<double> from;  // in seconds since 1970
    std::optional<double> until;
    Outcome outcome = Outcome::kSummary;
    std::int32_t index = 0;  // of the summary, from 1
    // Those that said earlier what still held when it ended, such as the device; and from the beginning to
    // the message that ended it, those that have one of the producer's keys. In order.
    std::span<const ValueMap* const> messages;
  };
  virtual void stretchEnded(const End& end) = 0;

  // No message is left. `runsSince`: when the stretch began that nothing ended, which gives no summary.
  virtual void walkEnded(std::size_t summaries, std::optional<double> runsSince) = 0;

 private:
  inline static constinit ReasonTrace* current_ = nullptr;
};

}  // namespace tonewerk
