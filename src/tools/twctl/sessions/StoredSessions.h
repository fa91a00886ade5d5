// SPDX-License-Identifier: Apache-2.0
#pragma once

#include <cstdint>
#include <functional>
#include <optional>
#include <string>

#include "tools/twctl/sql/SqlReader.h"

namespace tonewerk {

// A row of the store's view `session`.
struct StoredSession {
  std::int64_t id = 0;
  std::int64_t reporterID = 0;
  std::optional<std::string> service;
  std::optional<std::string> application;
  std::optional<std::string> process;
  std::int64_t user = 0;
  double startedAt = 0.0;             // seconds since 1970
  std::optional<double> endedAt;      // none while it runs
  std::optional<std::string> ending;  // none while it runs
  std::optional<std::int64_t> messages;
  std::optional<std::int64_t> redundantMessages;
  std::optional<double> activeSeconds;
  std::optional<std::int64_t> overloads;
};

// Chooses sessions. Patterns may have *, ? and [...].
struct SessionFilter {
  std::optional<double> since;  // that ran then or later, in seconds since 1970
  std::optional<double> until;  // that ran then or earlier
  std::optional<std::string> application;
  std::optional<std::string> service;
  std::optional<std::string> device;    // that played or recorded on such devices
  std::optional<std::int64_t> session;  // its id
  std::optional<std::int64_t> limit;    // the newest so many
};

// Calls `take` for each session of the filter, in the order in which they began. False when the store cannot
// be read; `problem` says why.
[[nodiscard]] bool readSessions(SqlReader& reader, const SessionFilter& filter, std::string& problem,
                                const std::function<void(const StoredSession& session)>& take);

// The session with this id. None when there is none, or when the store cannot be read; `problem` then says
// what was not found and how to list what there is.
[[nodiscard]] std::optional<StoredSession> readSession(SqlReader& reader, std::int64_t id,
                                                       std::string& problem);

}  // namespace tonewerk
