// SPDX-License-Identifier: Apache-2.0
#pragma once

#include <cstdint>
#include <optional>
#include <string_view>

#include "platform/Log.h"
#include "session/TWReportingSessionMessage.h"
#include "values/Value.h"

namespace tonewerk {

// Folds a session's stored messages into summaries, one for each interval in which output or input ran under
// the same conditions.
//
//   running      |-----------------------------|
//   conditions   A ............ B ..............
//   intervals    |----- A -----||----- B ------|
//
// The walk keeps the latest value of every key, finds where intervals begin and end, leaves out those that
// are too short, numbers and counts the summaries, and logs what it does. A producer derives from it and says
// which changes end an interval and what a summary holds. An object walks once, on the work queue.
class IntervalWalk {
 public:
  // What happens to an interval that the previous values show as running.
  enum class OpenInterval {
    kContinues,  // it began at the time in the previous values
    kIgnored,    // it yields no summary; the first message that says "running" begins an interval
    kNoBegin,    // it yields no summary; only a change or a new start begins an interval
  };

  struct Kind {
    std::string_view runningKey;  // its value says whether output or input runs
    OpenInterval openInterval = OpenInterval::kContinues;
    AudioEventCategory category = 0;  // of the summaries
    // The producer's names in the log lines: "createVolumeMessages", "volume", "playingTime".
    std::string_view function;
    std::string_view subject;
    std::string_view length;
  };

  // An interval that has ended.
  struct Interval {
    double seconds = 0.0;
    std::int32_t index = 0;  // of its summary, from 1

    // The length with single precision, and as the nearest of some round times.
    Value length() const;
    Value bucketedLength() const;
  };

  // `site` is the producer's source file and line, which the log lines carry. Intervals of `minimumSeconds`
  // or less are too short. The walk's state begins with `defaults` and then the session's previous values.
  // The texts of `kind` outlive the walk.
  IntervalWalk(const Kind& kind, const LogSite& site, double minimumSeconds, ValueMap defaults,
               const ValueMap& previousValues);
  IntervalWalk(const IntervalWalk&) = delete;
  IntervalWalk& operator=(const IntervalWalk&) = delete;
  virtual ~IntervalWalk() = default;

  // The summaries of `messages`, in order. Each says how many there are.
  TWReportingSessionMessages summariesOf(const TWReportingSessionMessages& messages);

 protected:
  // The latest value of every key, before the message that is being looked at.
  const ValueMap& state() const { return state_; }
  // The latest value of one key, which the state must have.
  Value current(std::string_view key) const { return *state_.find(key); }
  // Whether the state and the message both have the key, with different texts.
  bool changesText(const ValueMap& message, std::string_view key) const;

 private:
  // Whether a message that starts output or input begins an interval.
  virtual bool begins(const ValueMap& /*message*/) const { return true; }
  // Whether a message ends the interval although output or input still runs.
  virtual bool endsInterval(const ValueMap& message) const = 0;
  // Called for each message while output or input runs, before the message ends an interval.
  virtual void collect(const ValueMap& /*message*/) {}
  // The summary of an interval that is long enough. state() is still what it was before the message that ends
  // it. None when the interval yields no summary.
  virtual std::optional<ValueMap> summaryOf(const Interval& interval) = 0;

  void step(const ValueMap& message);
  void endInterval(const std::optional<Value>& end);
  std::optional<double> measure(const std::optional<Value>& end) const;
  std::optional<ValueMap> summaryUntil(const std::optional<Value>& end);

  const Kind kind_;
  const LogSite site_;
  const double minimumSeconds_;
  ValueMap state_;
  bool isRunning_ = false;
  std::optional<Value> begin_;  // the time at which the current interval began
  TWReportingSessionMessages summaries_;
};

}  // namespace tonewerk
