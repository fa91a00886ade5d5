// SPDX-License-Identifier: Apache-2.0
#pragma once

#include <cstdint>
#include <optional>
#include <stop_token>
#include <string>

namespace tonewerk {

// What a report is about: everything in the store, or less.
struct ReportScope {
  std::optional<double> since;             // seconds since 1970, inclusive
  std::optional<double> until;             // seconds since 1970, inclusive
  std::optional<std::string> application;  // a pattern with *, ? and [...]
  std::optional<std::int64_t> session;     // the `id` of the view `session`
  bool daemonAnswers = false;              // so a session without an end still runs
  std::stop_token stop;                    // ends the reading early, which is then a problem
  bool hasRunning = false;                 // also what the sessions that still run have said of playback
};

}  // namespace tonewerk
