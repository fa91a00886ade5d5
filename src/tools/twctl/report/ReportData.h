// SPDX-License-Identifier: Apache-2.0
#pragma once

#include <string>

#include "tools/twctl/report/ReportScope.h"
#include "values/ValueMap.h"

namespace tonewerk {

// What a report says of the store: everything that its pictures, tables and sentences show.
struct ReportData {
  ValueMap data;  // for the page; docs/report.md describes what it shows
  // On demand: what the sessions that still run have said of playback, newest first, as a list of rows:
  // reporter, started (of the session), at, running, volume, device, ringer, application.
  ValueMap running;
  std::string problem;  // empty on success
  bool isUnknownSession = false;

  // Reads the store in `directory`. `now` is the time in seconds since 1970.
  static ReportData read(const std::string& directory, const ReportScope& scope, double now);

  // So many of each at most; what is left out is counted in the data.
  static constexpr int kMostSessions = 400;  // in the timeline
  static constexpr int kLongestSessions =
      320;  // of them those that played longest; the others overloaded most
  static constexpr int kMostStretches = 10'000;
  static constexpr int kMostMarks = 3'000;         // issues, and as many input stretches
  static constexpr int kMostGlitches = 1'500;      // in the timeline
  static constexpr int kMostListedGlitches = 100;  // in their table
  static constexpr int kMostHaptics = 1'000;
  static constexpr int kMostRows = 250;     // in a table of one session
  static constexpr int kMostNames = 12;     // applications, devices
  static constexpr int kMostChannels = 12;  // histograms, and as many states
  static constexpr int kMostParts = 64;     // buckets of a histogram, states of a channel
  static constexpr int kMostDays = 92;      // in the heat map
  static constexpr int kMostSteps = 368;    // hours, days or weeks in the picture of overloads
  static constexpr int kMostRunning = 100;  // sessions that still run
  static constexpr int kMostSaid = 10'000;  // messages of them
};

}  // namespace tonewerk
