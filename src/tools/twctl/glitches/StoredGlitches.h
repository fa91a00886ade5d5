// SPDX-License-Identifier: Apache-2.0
#pragma once

#include <cstdint>
#include <functional>
#include <optional>
#include <string>
#include <vector>

#include "tools/twctl/sessions/GlitchVerdict.h"
#include "tools/twctl/sql/SqlReader.h"

namespace tonewerk {

// A glitch: what the rows of one `glitch_id` say, one for each session that lost audio to it.
struct StoredGlitch {
  GlitchVerdict verdict;               // of the session that it was worst for
  std::int64_t sessions = 0;           // how many it concerned
  std::int64_t applications = 0;       // how many different ones
  std::optional<std::string> heardBy;  // one of these applications
  std::int64_t overloads = 1;          // so many with the same cause within a second
  std::optional<double> lostMs;        // the most that a session lost
};

// Chooses glitches. Patterns may have *, ? and [...].
struct GlitchFilter {
  std::optional<double> since;  // in seconds since 1970
  std::optional<double> until;
  std::optional<std::string> application;  // that lost audio, or caused it
  std::optional<std::string> device;
  std::optional<std::string> service;  // of a session that lost audio
  std::optional<std::int64_t> session;
  std::optional<std::int64_t> limit;  // the newest so many
};

// How glitches are added up.
enum class GlitchKey { kApplication, kCause, kDevice, kHour };

// All glitches of one application, cause, device or hour.
struct GlitchSum {
  std::optional<std::string> key;  // none when it is not known; an hour is one of the local clock
  std::int64_t glitches = 0;       // each overload counts, once for all its sessions
  double share = 0.0;              // of all, 0 to 1
  double lostMs = 0.0;             // added up
  std::optional<double> worstMs;   // beyond the period's end
  double firstAt = 0.0;
  double lastAt = 0.0;
};

struct GlitchSums {
  std::vector<GlitchSum> sums;
  std::int64_t glitches = 0;  // of all, also of the sums that the limit leaves out
};

// Calls `take` for each glitch of the filter, the oldest first. False when the store cannot be read;
// `problem` says why.
[[nodiscard]] bool readGlitches(SqlReader& reader, const GlitchFilter& filter, std::string& problem,
                                const std::function<void(const StoredGlitch& glitch)>& take);

// The sums over the glitches of the filter, those with most glitches first, hours in their order. The limit
// leaves out sums, not glitches. None when the store cannot be read.
[[nodiscard]] std::optional<GlitchSums> sumGlitches(SqlReader& reader, const GlitchFilter& filter,
                                                    GlitchKey key, std::string& problem);

// One glitch in each of its sessions, the one that it was worst for first.
struct GlitchInSessions {
  std::vector<GlitchVerdict> verdicts;  // at most kMostSessions
  std::int64_t sessions = 0;            // how many there are
  std::string cycles;                   // JSON; empty when there are none

  static constexpr int kMostSessions = 32;
};

// `id`: a glitch's own, or the number of one of its events. None when there is none such, or when
// the store cannot be read; `problem` then says what was not found and which ones are near.
[[nodiscard]] std::optional<GlitchInSessions> readGlitch(SqlReader& reader, const std::string& id,
                                                         std::string& problem);

}  // namespace tonewerk
