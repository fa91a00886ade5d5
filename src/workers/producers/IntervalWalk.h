// SPDX-License-Identifier: Apache-2.0
#pragma once

#include <cstddef>
#include <cstdint>
#include <optional>
#include <span>
#include <string_view>
#include <vector>

#include "platform/Log.h"
#include "session/KeySlots.h"
#include "session/MessageRange.h"
#include "session/ReasonTrace.h"
#include "session/TWReportingSessionMessage.h"
#include "values/Value.h"
#include "values/ValueView.h"

namespace tonewerk {

// Folds a session's stored messages into summaries, one for each interval in which output or input ran under
// the same conditions.
//
//   running      |-----------------------------|
//   conditions   A ............ B ..............
//   intervals    |----- A -----||----- B ------|
//
// The walk finds where intervals begin and end, leaves out those that are too short, numbers and counts the
// summaries, and logs what it does. A producer derives from it and says what ends an interval and what
// a summary holds. An object walks once, on the work queue.
//
// Sessions store many messages, and few of them end an interval. So the walk does not collect what every
// message says. It passes over messages that have none of its keys. It reads a few keys of the others, and
// searches the earlier messages for the other values that it needs (see Latest).
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
  // or less are too short. The walk begins with what the session's previous values say. The texts of `kind`
  // outlive the walk.
  IntervalWalk(const Kind& kind, const LogSite& site, double minimumSeconds, ValueMap previousValues);
  IntervalWalk(const IntervalWalk&) = delete;
  IntervalWalk& operator=(const IntervalWalk&) = delete;
  virtual ~IntervalWalk() = default;

  // The summaries of `messages` without those at the places `leftOut`, which ascend. In order; each says how
  // many there are. Nobody may change the messages meanwhile.
  TWReportingSessionMessages summariesOf(MessageRange messages, std::span<const std::size_t> leftOut = {});

 protected:
  // Initial values, made once.
  static const Value kUnknownText;  // "unknown"
  static const Value kFalse;
  static const Value kMinusOne;

  // The latest value of one key before the message that is being looked at. It is searched only when it is
  // asked for, from there backwards to the last search. So each message is searched at most once, and mostly
  // only the one before.
  class Latest {
   public:
    // `initial` is the value when neither the messages nor the previous values have the key. It outlives the
    // walk; null for none. Made with the walk, which from then on looks at the messages that have the key.
    Latest(IntervalWalk& walk, std::string_view key, const Value* initial = nullptr)
        : walk_(walk), name_(key), key_(walk.keys_.add(key)), initial_(initial) {
      if (ReasonTrace::current() != nullptr) walk_.latest_.push_back(this);
    }
    Latest(const Latest&) = delete;
    Latest& operator=(const Latest&) = delete;

    // None when there is none. Valid as long as the walk.
    ValueView find();
    // Only when there is one.
    Value value() { return find().value(); }
    // What the message that is being looked at says; none when it does not have the key.
    ValueView now();

    // Whether there are both values, and they differ: in their texts, as numbers, or as values.
    bool changesText();
    bool changesNumber();
    bool changes();

    std::string_view name() const { return name_; }
    // For the trace of reasons: the place of the message that said what find() gives; none for other values.
    std::optional<std::size_t> source() {
      find();
      return source_ == 0 ? std::nullopt : std::optional(source_ - 1);
    }

   private:
    // Remembers a change for the trace of reasons.
    bool noted(bool isChange) {
      if (isChange) walk_.change_ = this;
      return isChange;
    }
    ValueView in(std::size_t place);

    IntervalWalk& walk_;
    const std::string_view name_;
    const std::size_t key_;  // its index in the walk's keys
    const Value* const initial_;
    ValueView value_;  // the latest one in the first searched_ messages
    std::size_t searched_ = 0;
    std::size_t source_ = 0;    // place + 1 of the message that value_ is from; 0 for none
    bool hasBegun_ = false;     // false until value_ is the value before the first message
    std::size_t lookedUp_ = 0;  // place + 1 of the message that `found_` is from; 0 for none
    ValueView found_;
  };

  // The message that is being looked at.
  const ValueMap& message() const { return *walked_.back(); }
  // Whether it says that output or input runs, or that it does not.
  bool saysRunning() const { return static_cast<bool>(running_); }

  // For the trace of reasons: returns true, since a change of this value ends the interval; returns no
  // summary, for this reason.
  bool endsBy(Latest& value) {
    change_ = &value;
    return true;
  }
  std::optional<ValueMap> withhold(ReasonTrace::Outcome why) {
    outcome_ = why;
    return std::nullopt;
  }

 private:
  // Whether a message that starts output or input begins an interval.
  virtual bool begins() { return true; }
  // The key that decides that, for the trace of reasons.
  virtual std::string_view beginKey() const { return {}; }
  // Whether a message ends the interval although output or input still runs.
  virtual bool endsInterval() = 0;
  // Called for each message while output or input runs, before the message ends an interval.
  virtual void collect() {}
  // The summary of an interval that is long enough. The message that ends the interval is being looked at.
  // None when the interval yields no summary.
  virtual std::optional<ValueMap> summaryOf(const Interval& interval) = 0;

  void step();
  // The previous values show output or input running.
  void beginRunning();
  void beginInterval();
  void endInterval(const std::optional<Value>& end);
  std::optional<double> measure(const std::optional<Value>& end);
  std::optional<ValueMap> summaryUntil(const std::optional<Value>& end);
  void tellEnd(ReasonTrace& reasons, const std::optional<Value>& end);

  const Kind kind_;
  const LogSite site_;
  const double minimumSeconds_;
  const ValueMap previousValues_;
  // Has every key that a message must have to make the walk do anything.
  KeySlots keys_;
  const std::size_t runningKey_;
  const std::size_t durationKey_;
  std::vector<const ValueMap*> walked_;  // those with a key, up to the message that is being looked at
  ValueView running_;                    // what this message says
  bool wasRunning_ = false;              // what the latest message before it says that says something
  bool isRunning_ = false;
  std::optional<Value> begin_;  // the time at which the current interval began
  TWReportingSessionMessages summaries_;

  // What the trace of reasons is told, if there is one.
  std::vector<Latest*> latest_;  // all of them
  Latest* change_ = nullptr;     // the value that changed last
  std::size_t beginPlace_ = 0;   // in walked_, of the message that began the interval
  ReasonTrace::Cause cause_ = ReasonTrace::Cause::kStopped;
  ReasonTrace::Outcome outcome_ = ReasonTrace::Outcome::kSummary;
};

}  // namespace tonewerk
