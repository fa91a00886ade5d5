// SPDX-License-Identifier: Apache-2.0
#pragma once

#include <cstdint>
#include <optional>
#include <string_view>

#include "platform/Log.h"
#include "session/TWReportingSessionMessage.h"
#include "values/Value.h"

namespace tonewerk {

// The summaries that one walk over a session's messages yields, one for each stretch of output or input.
//
// Here is what the producers of such summaries do alike: which stretch is too short, how its length is told,
// how the summaries are numbered and counted, and what is logged about that. When a stretch begins and ends,
// and what its summary says, is each producer's own.
//
//   const auto seconds = summaries.measure(TWReportingSessionCategory(), begin, end);
//   if (!seconds) return summaries.skip(TWReportingSessionCategory());
//   summaries.add(TWReportingSessionCategory(), {..., {"msgidx", summaries.nextIndex()}}, kCategoryVolume);
//
// The log lines are the producer's: each call passes the category, and with it its own file and line.
class IntervalSummaries {
 public:
  // The producer's words in the log lines. They outlive the object.
  struct Words {
    std::string_view function;  // "createVolumeMessages"
    std::string_view subject;   // "volume"
    std::string_view length;    // "playingTime"
  };

  // Stretches of `minimumSeconds` or less are too short.
  IntervalSummaries(const Words& words, double minimumSeconds)
      : words_(words), minimumSeconds_(minimumSeconds) {}

  // When the message was sent, as it says; none when it does not.
  static std::optional<Value> timestampOf(const ValueMap& message);

  // How many seconds a stretch took; none for one that is too short, also because a time is absent or its
  // length is no number.
  std::optional<double> measure(const LogSite& site, const std::optional<Value>& begin,
                                const std::optional<Value>& end) const;
  // A length as summaries give it: with single precision, and as the nearest of some round times.
  static Value seconds(double length);
  static Value bucketedSeconds(double length);

  // A stretch yields no summary.
  void skip(const LogSite& site) const;
  // The number of the summary that is added next, from 1.
  std::int32_t nextIndex() const { return static_cast<std::int32_t>(summaries_.size()) + 1; }
  // The record stays good until finish().
  TWReportingSessionMessage& add(const LogSite& site, ValueMap summary, AudioEventCategory category);

  // All of them, in order, each told how many there are. Ends the walk.
  TWReportingSessionMessages finish();

 private:
  const Words words_;
  const double minimumSeconds_;
  TWReportingSessionMessages summaries_;
};

}  // namespace tonewerk
