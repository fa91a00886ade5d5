// SPDX-License-Identifier: Apache-2.0
#pragma once

#include <cstdint>
#include <functional>
#include <optional>
#include <string>

#include "platform/linux/store/SqliteDatabase.h"

namespace tonewerk {

// One analytics event in the report store.
struct StoredEvent {
  std::int64_t id = 0;
  double recordedAt = 0.0;  // seconds since 1970
  std::string name;
  std::string payload;  // JSON
};

// One event of the power log in it.
struct StoredPowerEvent {
  std::int64_t id = 0;
  double recordedAt = 0.0;
  std::int64_t group = 0;
  std::string name;
  std::string payload;
};

// How long one application had the haptics engine on, in the unit that the application reports.
struct EngineOnTotal {
  std::optional<std::string> application;  // none for the applications whose name is not known
  double duration = 0.0;
  std::int64_t events = 0;
};

// One metric record in it.
struct StoredMetric {
  std::int64_t id = 0;
  double postedAt = 0.0;
  std::int64_t identifier = 0;
  std::string record;  // bytes
};

// One real-time-communication session in it.
struct StoredRtcSession {
  std::int64_t id = 0;
  double startedAt = 0.0;
  std::string sessionInfo;  // JSON
  std::string userInfo;     // JSON
};

// One message of such a session.
struct StoredRtcMessage {
  std::int64_t id = 0;
  double sentAt = 0.0;
  std::int64_t session = 0;  // the id of its session
  std::int64_t category = 0;
  std::int64_t type = 0;
  std::string payload;
};

struct EventFilter {
  std::optional<std::string> name;  // a pattern with *, ? and [...]
  std::optional<double> since;      // seconds since 1970, inclusive
  std::optional<double> until;      // seconds since 1970, inclusive
  std::int64_t afterId = 0;
  std::optional<std::int64_t> limit;  // only the newest so many
};

// Reads a report store, also while a daemon writes to it. Used by one thread at a time.
class StoreReader {
 public:
  enum class Outcome { kDone, kNoStore, kFailed };

  // Opens the store in `directory`. kNoStore when there is none, or when nothing has been stored in it yet.
  [[nodiscard]] Outcome open(const std::string& directory);

  // Calls `take` for each event that passes the filter, oldest first. False on failure. The other functions
  // do the same with other rows.
  [[nodiscard]] bool readEvents(const EventFilter& filter,
                                const std::function<void(const StoredEvent& event)>& take);

  [[nodiscard]] bool readPowerEvents(const EventFilter& filter,
                                     const std::function<void(const StoredPowerEvent& event)>& take);
  // Sums up the power events that pass the filter. The application with the longest time comes first.
  [[nodiscard]] bool readEngineOnTotals(const EventFilter& filter,
                                        const std::function<void(const EngineOnTotal& total)>& take);

  // A metric has no name: the filter's name is ignored.
  [[nodiscard]] bool readMetrics(const EventFilter& filter,
                                 const std::function<void(const StoredMetric& metric)>& take);

  // The name that the filter compares is that of the session's service, as "telephony_session".
  [[nodiscard]] bool readRtcSessions(const EventFilter& filter,
                                     const std::function<void(const StoredRtcSession& session)>& take);
  [[nodiscard]] bool readRtcMessages(const EventFilter& filter,
                                     const std::function<void(const StoredRtcMessage& message)>& take);

  // Whether the file that was opened is no longer at its path.
  bool hasMoved() const { return database_.hasMoved(); }
  // Describes the last failure, with the file's path.
  const std::string& problem() const { return problem_; }

 private:
  // Runs `sql` with the filter's parameters and calls `take` for each row.
  [[nodiscard]] bool readRows(const std::string& sql, const EventFilter& filter,
                              const std::function<void(const SqliteStatement& row)>& take);
  [[nodiscard]] Outcome openAs(SqliteDatabase::Mode mode);
  [[nodiscard]] Outcome fail(const std::string& problem);

  std::string path_;
  SqliteDatabase database_;
  std::string problem_;
};

}  // namespace tonewerk
