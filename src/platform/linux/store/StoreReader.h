// SPDX-License-Identifier: Apache-2.0
#pragma once

#include <cstdint>
#include <functional>
#include <optional>
#include <string>

#include "platform/linux/store/SqliteDatabase.h"

namespace tonewerk {

// One analytics event as the report store holds it.
struct StoredEvent {
  std::int64_t id = 0;
  double recordedAt = 0.0;  // seconds since 1970
  std::string name;
  std::string payload;  // JSON
};

// One event of the power log, likewise.
struct StoredPowerEvent {
  std::int64_t id = 0;
  double recordedAt = 0.0;
  std::int64_t group = 0;
  std::string name;
  std::string payload;
};

// For how long one application had the haptics engine on, in whatever unit it reports that.
struct EngineOnTotal {
  std::optional<std::string> application;  // none for those whose name is not known
  double duration = 0.0;
  std::int64_t events = 0;
};

// One metric record.
struct StoredMetric {
  std::int64_t id = 0;
  double postedAt = 0.0;
  std::int64_t identifier = 0;
  std::string record;  // bytes
};

// One real-time-communication session, likewise.
struct StoredRtcSession {
  std::int64_t id = 0;
  double startedAt = 0.0;
  std::string sessionInfo;  // JSON
  std::string userInfo;     // JSON
};

// One of its messages, likewise.
struct StoredRtcMessage {
  std::int64_t id = 0;
  double sentAt = 0.0;
  std::int64_t session = 0;  // its session's id
  std::int64_t category = 0;
  std::int64_t type = 0;
  std::string payload;
};

struct EventFilter {
  std::optional<std::string> name;  // a pattern with *, ? and [...]
  std::optional<double> since;      // seconds since 1970, inclusive
  std::optional<double> until;      // likewise
  std::int64_t afterId = 0;
  std::optional<std::int64_t> limit;  // the newest so many
};

// Reads a report store, with a daemon writing to it or without. One thread.
class StoreReader {
 public:
  enum class Outcome { kDone, kNoStore, kFailed };

  // The store in `directory`. kNoStore when there is none, or none with anything in it yet.
  [[nodiscard]] Outcome open(const std::string& directory);

  // Every event that passes, oldest first. False on failure.
  [[nodiscard]] bool readEvents(const EventFilter& filter,
                                const std::function<void(const StoredEvent& event)>& take);

  [[nodiscard]] bool readPowerEvents(const EventFilter& filter,
                                     const std::function<void(const StoredPowerEvent& event)>& take);
  // Of the power events that pass, the application with the longest time first.
  [[nodiscard]] bool readEngineOnTotals(const EventFilter& filter,
                                        const std::function<void(const EngineOnTotal& total)>& take);

  // Metrics have no name to choose by.
  [[nodiscard]] bool readMetrics(const EventFilter& filter,
                                 const std::function<void(const StoredMetric& metric)>& take);

  // A name is that of the session's service, as "telephony_session".
  [[nodiscard]] bool readRtcSessions(const EventFilter& filter,
                                     const std::function<void(const StoredRtcSession& session)>& take);
  [[nodiscard]] bool readRtcMessages(const EventFilter& filter,
                                     const std::function<void(const StoredRtcMessage& message)>& take);

  // Whether another file has taken the place of the one opened.
  bool hasMoved() const { return database_.hasMoved(); }
  // What the last failure was, with the file's path.
  const std::string& problem() const { return problem_; }

 private:
  // Runs `take` at each row of a query with the filter's parameters.
  [[nodiscard]] bool readRows(const std::string& sql, const EventFilter& filter,
                              const std::function<void(const SqliteStatement& row)>& take);
  [[nodiscard]] Outcome openAs(SqliteDatabase::Mode mode);
  [[nodiscard]] Outcome fail(const std::string& problem);

  std::string path_;
  SqliteDatabase database_;
  std::string problem_;
};

}  // namespace tonewerk
