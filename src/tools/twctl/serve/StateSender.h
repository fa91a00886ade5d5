// SPDX-License-Identifier: Apache-2.0
#pragma once

#include <chrono>
#include <optional>
#include <string>

#include "tools/twctl/serve/DaemonWatch.h"
#include "tools/twctl/serve/LiveFeed.h"
#include "tools/twctl/serve/StoredReport.h"
#include "values/ValueMap.h"

namespace tonewerk {

// Publishes the state for the page whenever it has changed. Used by one thread.
class StateSender {
 public:
  using Time = DaemonWatch::Time;

  static constexpr std::chrono::milliseconds kLeastPause{100};

  // The state has the sessions whose application fits the pattern; all without one. `feed` outlives it.
  StateSender(LiveFeed& feed, std::optional<std::string> application)
      : feed_(feed), application_(std::move(application)) {}

  // Compares the state with the last one and publishes it, at most once in kLeastPause. `now` is the time in
  // seconds since 1970, which the state has as that of the change.
  void send(const DaemonWatch& daemon, const StoredReport::Reading& stored, Time time, double now);

  // When send() is to be called again, because it came too early; none otherwise.
  [[nodiscard]] std::optional<Time> heldBackUntil() const {
    return isHeldBack_ ? std::optional(nextTime_) : std::nullopt;
  }

 private:
  [[nodiscard]] ValueMap stateOf(const DaemonWatch& daemon, const StoredReport::Reading& stored) const;
  [[nodiscard]] bool isInScope(const std::string& application) const;

  LiveFeed& feed_;
  const std::optional<std::string> application_;
  std::string sent_;
  Time nextTime_ = Time::min();
  bool isHeldBack_ = false;
  std::optional<double> lostAt_;  // since when the daemon does not answer
};

}  // namespace tonewerk
