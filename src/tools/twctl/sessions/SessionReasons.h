// SPDX-License-Identifier: Apache-2.0
#pragma once

#include <cstdint>
#include <iosfwd>
#include <optional>
#include <string>
#include <string_view>
#include <vector>

#include "tools/twctl/sessions/SessionRecords.h"
#include "tools/twctl/sessions/StoredSessions.h"
#include "values/Value.h"

namespace tonewerk {

class JsonService;

// Which event of the store a message became; absent when that is not known, and for a redundant one.
inline constexpr std::string_view kMessageKeyEvent = "event";

// Why the core did what it did in one life of a session, as it told when the session was played again. The
// maps have the keys of tools/recording/ReasonKeys.h.
struct ReasonedLife {
  // What a producer looked for, and found.
  struct Walk {
    ValueMap about;               // "walk"
    std::vector<ValueMap> steps;  // "rapid", "stretch" and "stretchEnd", in order
    ValueMap end;                 // "walkEnd"
  };

  std::int64_t reporterID = 0;
  std::int64_t user = 0;
  std::optional<std::string> process;
  std::optional<double> startedAt;  // in seconds since 1970
  std::vector<ValueMap> messages;   // "message", in the order of their arrival
  std::vector<Walk> walks;
  std::optional<ValueMap> end;  // "end"
  // What the daemon made and the store has, but not the replay, which has no device. With nameEvents().
  std::vector<StoredPayload> onlyStored;

  // Null when there is no such message.
  const ValueMap* message(std::int64_t number) const;
  // The message, the one that it repeats, and those that repeat the same one, in order.
  std::vector<const ValueMap*> equalTo(std::int64_t number) const;
  // The "stretchEnd" that gave the summary with this number; null when there was none.
  const ValueMap* summaryEnd(const std::string& category, std::int64_t index) const;
  // The message that the store has as this event; null when it is not known. With nameEvents().
  const ValueMap* messageOf(std::int64_t event) const;
  // The walk for the summaries of this category; null when there was none.
  const Walk* walk(const std::string& category) const;
};

// Reads what `tw-replay --reasons` has printed. None when a line is something else; `problem` says which one.
[[nodiscard]] std::optional<std::vector<ReasonedLife>> readReasons(std::istream& text,
                                                                   const JsonService& json,
                                                                   std::string& problem);

// Says which events of the session its messages became. Those of a category and type came in the same order.
// Their times differ: where a client gave none, the replay has that of the journal. A message that the daemon
// made gets the payload that was recorded instead of the replay's, which has other values of the device, and
// none when the store does not have it.
void nameEvents(ReasonedLife& life, const std::vector<StoredPayload>& events, const JsonService& json);

// The life of a session in the store; null when there is none. Clients may use the same identifier at the
// same time, so users and processes are compared, too.
[[nodiscard]] const ReasonedLife* lifeOf(const std::vector<ReasonedLife>& lives,
                                         const StoredSession& session);

}  // namespace tonewerk
