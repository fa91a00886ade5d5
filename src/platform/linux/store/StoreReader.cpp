// SPDX-License-Identifier: Apache-2.0
#include "platform/linux/store/StoreReader.h"

#include <chrono>
#include <filesystem>
#include <system_error>

#include "platform/linux/store/StoreFile.h"
#include "platform/linux/store/StoreQueries.h"
#include "platform/linux/store/StoreSchema.h"

namespace tonewerk {
namespace {

constexpr std::chrono::seconds kPatience{5};
constexpr std::int64_t kFirstWithSessions = 3;  // of the versions of the schema

}  // namespace

StoreReader::Outcome StoreReader::open(const std::string& directory) {
  path_ = storeFileIn(directory).path;
  std::error_code error;
  if (!std::filesystem::exists(path_, error)) {
    if (error) return fail(error.message());
    problem_ = path_ + ": there is no such file";
    return Outcome::kNoStore;
  }
  const Outcome outcome = openAs(SqliteDatabase::Mode::kReadOnly);
  // Reading needs a side file, which a user without write permission for the directory cannot make. While a
  // daemon writes, the side file is there. Without one the file does not change, so that it can be read as it
  // is.
  if (outcome != Outcome::kFailed || std::filesystem::exists(path_ + "-wal", error)) return outcome;
  return openAs(SqliteDatabase::Mode::kImmutable);
}

bool StoreReader::readMessages(const EventFilter& filter,
                               const std::function<void(const StoredMessage& message)>& take) {
  const auto textOrNone = [](const SqliteStatement& row, int column) {
    return row.isNull(column) ? std::nullopt : std::optional(row.text(column));
  };
  return readOfSessions(messageQuery(filter, knowsSessions_), filter, [&](const SqliteStatement& row) {
    StoredMessage message{.id = row.integer(0),
                          .recordedAt = row.number(1),
                          .name = row.text(2),
                          .secondName = textOrNone(row, 3),
                          .payload = row.text(4),
                          .session = std::nullopt,
                          .application = textOrNone(row, 6),
                          .isDerived = row.integer(7) != 0};
    if (!row.isNull(5)) message.session = row.integer(5);
    take(message);
  });
}

bool StoreReader::readEvents(const EventFilter& filter,
                             const std::function<void(const StoredEvent& event)>& take) {
  return readOfSessions(eventQuery(filter), filter, [&](const SqliteStatement& row) {
    take({row.integer(0), row.number(1), row.text(2), row.text(3)});
  });
}

bool StoreReader::readPowerEvents(const EventFilter& filter,
                                  const std::function<void(const StoredPowerEvent& event)>& take) {
  return readRows(powerQuery(filter), filter, [&](const SqliteStatement& row) {
    take({row.integer(0), row.number(1), row.integer(2), row.text(3), row.text(4)});
  });
}

bool StoreReader::readEngineOnTotals(const EventFilter& filter,
                                     const std::function<void(const EngineOnTotal& total)>& take) {
  return readRows(engineOnQuery(filter), filter, [&](const SqliteStatement& row) {
    EngineOnTotal total{std::nullopt, row.number(1), row.integer(2)};
    if (!row.isNull(0)) total.application = row.text(0);
    take(total);
  });
}

bool StoreReader::readMetrics(const EventFilter& filter,
                              const std::function<void(const StoredMetric& metric)>& take) {
  return readRows(metricQuery(filter), filter, [&](const SqliteStatement& row) {
    take({row.integer(0), row.number(1), row.integer(2), row.bytes(3)});
  });
}

bool StoreReader::readRtcSessions(const EventFilter& filter,
                                  const std::function<void(const StoredRtcSession& session)>& take) {
  return readRows(rtcSessionQuery(filter), filter, [&](const SqliteStatement& row) {
    take({row.integer(0), row.number(1), row.text(2), row.text(3)});
  });
}

bool StoreReader::readRtcMessages(const EventFilter& filter,
                                  const std::function<void(const StoredRtcMessage& message)>& take) {
  return readRows(rtcMessageQuery(filter), filter, [&](const SqliteStatement& row) {
    take({row.integer(0), row.number(1), row.integer(2), row.integer(3), row.integer(4), row.text(5)});
  });
}

bool StoreReader::readOfSessions(const std::string& sql, const EventFilter& filter,
                                 const std::function<void(const SqliteStatement& row)>& take) {
  const bool asksForSessions = filter.application || filter.device || filter.service || filter.session;
  if (knowsSessions_ || !asksForSessions) return readRows(sql, filter, take);
  problem_ =
      path_ + ": an earlier version made it, and it does not know sessions before a daemon has used it";
  return false;
}

bool StoreReader::readRows(const std::string& sql, const EventFilter& filter,
                           const std::function<void(const SqliteStatement& row)>& take) {
  SqliteStatement select = database_.prepare(sql);
  select.bind(1, kStoreNamesPerRow);
  select.bind(2, filter.afterId);
  if (filter.name) select.bind(3, std::string_view(*filter.name));
  if (filter.since) select.bind(4, *filter.since);
  if (filter.until) select.bind(5, *filter.until);
  if (filter.limit) select.bind(6, *filter.limit);
  if (filter.application) select.bind(7, std::string_view(*filter.application));
  if (filter.device) select.bind(8, std::string_view(*filter.device));
  if (filter.service) select.bind(9, std::string_view(*filter.service));
  if (filter.session) select.bind(10, *filter.session);
  for (;;) {
    switch (select.step()) {
      case SqliteStatement::Step::kRow:
        take(select);
        break;
      case SqliteStatement::Step::kDone:
        return true;
      case SqliteStatement::Step::kFailed:
        problem_ = path_ + ": " + database_.problem();
        return false;
    }
  }
}

StoreReader::Outcome StoreReader::openAs(SqliteDatabase::Mode mode) {
  if (!database_.open(path_, mode, kPatience)) return fail(database_.problem());
  const auto version = database_.number("PRAGMA user_version");
  if (!version) return fail(database_.problem());
  if (*version > kStoreSchemaVersion) return fail("it was made by a newer version");
  if (*version == 0) {
    problem_ = path_ + ": nothing has been stored yet";
    return Outcome::kNoStore;
  }
  knowsSessions_ = *version >= kFirstWithSessions;
  return Outcome::kDone;
}

StoreReader::Outcome StoreReader::fail(const std::string& problem) {
  problem_ = path_ + ": " + problem;
  return Outcome::kFailed;
}

}  // namespace tonewerk
