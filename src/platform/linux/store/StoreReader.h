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

// One message in it, once, whatever the number of its names.
struct StoredMessage {
  std::int64_t id = 0;      // that of the view `event`
  double recordedAt = 0.0;  // seconds since 1970
  std::string name;
  std::optional<std::string> secondName;
  std::string payload;                     // JSON
  std::optional<std::int64_t> session;     // none when it belongs to none, or its store does not know
  std::optional<std::string> application;  // of the session
  bool isDerived = false;                  // the daemon has made it
};

// Rows know some of this about themselves: see the functions that read them. Patterns may have *, ? and
// [...].
struct EventFilter {
  std::optional<std::string> name = std::nullopt;  // a pattern
  std::optional<double> since = std::nullopt;      // seconds since 1970, inclusive
  std::optional<double> until = std::nullopt;      // seconds since 1970, inclusive
  std::int64_t afterId = 0;
  std::optional<std::int64_t> limit = std::nullopt;       // only the newest so many
  std::optional<std::string> application = std::nullopt;  // a pattern
  std::optional<std::string> device =
      std::nullopt;  // a pattern: of sessions that played or recorded on such devices
  std::optional<std::string> service = std::nullopt;   // a pattern, as "telephony"
  std::optional<std::int64_t> session = std::nullopt;  // the id of the view `session`
};

// Reads a report store, also while a daemon writes to it. Used by one thread at a time.
class StoreReader {
 public:
  enum class Outcome { kDone, kNoStore, kFailed };

  // Opens the store in `directory`. kNoStore when there is none, or when nothing has been stored in it yet.
  [[nodiscard]] Outcome open(const std::string& directory);

  // Calls `take` for each event that passes the filter, oldest first. False on failure, also when the file is
  // of an earlier version, which does not know what the filter asks for. The other functions do the same with
  // other rows.
  [[nodiscard]] bool readMessages(const EventFilter& filter,
                                  const std::function<void(const StoredMessage& message)>& take);
  // With the names of a message as an event each.
  [[nodiscard]] bool readEvents(const EventFilter& filter,
                                const std::function<void(const StoredEvent& event)>& take);

  // Power events know their application, but no session, service or device.
  [[nodiscard]] bool readPowerEvents(const EventFilter& filter,
                                     const std::function<void(const StoredPowerEvent& event)>& take);
  // Sums up the power events that pass the filter. The application with the longest time comes first.
  [[nodiscard]] bool readEngineOnTotals(const EventFilter& filter,
                                        const std::function<void(const EngineOnTotal& total)>& take);

  // Metrics know only their time: the filter's name, and what it says of sessions, is ignored.
  [[nodiscard]] bool readMetrics(const EventFilter& filter,
                                 const std::function<void(const StoredMetric& metric)>& take);

  // The name that the filter compares is that of the session's service, as "telephony_session". They know
  // their application and service, but no session or device.
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
  // Reads messages or events, of which a file of an earlier version knows less.
  [[nodiscard]] bool readOfSessions(const std::string& sql, const EventFilter& filter,
                                    const std::function<void(const SqliteStatement& row)>& take);
  [[nodiscard]] Outcome openAs(SqliteDatabase::Mode mode);
  [[nodiscard]] Outcome fail(const std::string& problem);

  std::string path_;
  SqliteDatabase database_;
  bool knowsSessions_ = false;
  std::string problem_;
};

}  // namespace tonewerk
