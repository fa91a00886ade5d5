// SPDX-License-Identifier: Apache-2.0
#pragma once

#include <cstdint>
#include <map>
#include <optional>
#include <string>
#include <utility>
#include <vector>

#include "tools/twctl/sessions/GlitchVerdict.h"
#include "tools/twctl/sql/SqlReader.h"

namespace tonewerk {

// What the store has of one session, besides its row of the view `session`.
struct SessionRecords {
  struct Kind {
    std::string category;
    std::string type;
    std::string source;  // "client" or "derived"; empty when it is not known
    std::int64_t count = 0;
  };
  struct Stretch {
    std::int64_t event = 0;
    std::string category;  // "Volume", "Input" or "Gather"
    std::optional<double> from;
    std::optional<double> until;
    double seconds = 0.0;
    std::optional<std::string> device;
    std::optional<double> volume;
  };
  struct Issue {
    std::int64_t event = 0;
    double at = 0.0;
    std::string kind;
    std::optional<std::string> node;
    std::optional<double> seconds;
    std::optional<std::int64_t> frames;
    std::optional<GlitchVerdict> verdict = std::nullopt;  // of an overload, when somebody has judged it
  };

  std::vector<Kind> kinds;  // of the events, the most frequent ones first
  std::vector<Stretch> stretches;
  std::vector<Issue> issues;
  // The events that are summaries of stretches, by their category and their number among these.
  std::map<std::pair<std::string, std::int64_t>, std::int64_t> summaries;
};

// None when the store cannot be read; `problem` then says why.
[[nodiscard]] std::optional<SessionRecords> readRecords(SqlReader& reader, std::int64_t session,
                                                        std::string& problem);

// The cycles around the glitches of a session, as JSON, by their events; of the newest kMostGlitches. None
// when the store cannot be read; `problem` then says why.
inline constexpr int kMostGlitches = 1000;
[[nodiscard]] std::optional<std::map<std::int64_t, std::string>> readCycles(SqlReader& reader,
                                                                            std::int64_t session,
                                                                            std::string& problem);

// A row of the view `event`.
struct StoredEventRow {
  std::int64_t id = 0;
  double at = 0.0;
  std::optional<std::int64_t> session;
  std::string category;
  std::string type;
  std::string source;
  std::optional<std::int64_t> summary;  // its number among the summaries of its category

  // Whether it may be the summary of a stretch.
  bool isSummary() const { return source != "client" && type == "Summary" && summary; }
};

// What an event of a session says.
struct StoredPayload {
  std::int64_t event = 0;
  std::string category;
  std::string type;
  std::string source;   // "client" or "derived"; empty when it is not known
  double at = 0.0;      // when it was recorded, in seconds since 1970
  std::string payload;  // JSON, without the time of the message
};

// The events of a session, in the order in which they were recorded. None when the store cannot be read;
// `problem` then says why.
[[nodiscard]] std::optional<std::vector<StoredPayload>> readPayloads(SqlReader& reader, std::int64_t session,
                                                                     std::string& problem);

// None when there is no such event, or when the store cannot be read; `problem` then says what was not found
// and how to list what there is.
[[nodiscard]] std::optional<StoredEventRow> readEvent(SqlReader& reader, std::int64_t id,
                                                      std::string& problem);

}  // namespace tonewerk
