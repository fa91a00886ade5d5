// SPDX-License-Identifier: Apache-2.0
#include "tools/twctl/serve/LiveSessions.h"

#include <algorithm>
#include <cmath>
#include <limits>
#include <utility>

#include "protocol/WatchKeys.h"

namespace tonewerk {
namespace {

constexpr double kUnknown = std::numeric_limits<double>::quiet_NaN();
// The store and a listing date a session's start so differently at most.
constexpr double kSameStart = 2.0;
// The daemon's seconds are rounded.
constexpr std::chrono::milliseconds kRounding{1};
// No device runs longer.
constexpr double kMostSeconds = 1e9;
// A client's clock that is wrong by more than this is not believed.
constexpr double kMostLate = 3600.0;
constexpr std::string_view kRunning = "session_output_running";
constexpr std::string_view kVolume = "QMSessionVolume";
constexpr std::string_view kDevices = "active_devices";
constexpr std::string_view kRinger = "ringerstate";

// The later values replace the earlier ones.
void merge(PlayChange& state, const PlayChange& change) {
  if (change.isRunning) state.isRunning = change.isRunning;
  if (change.volume) state.volume = change.volume;
  if (change.device) state.device = change.device;
  if (change.ringer) state.ringer = change.ringer;
}

constexpr std::size_t kStoredCells = 8;

bool isKnown(const Value& cell) { return cell.asDouble() == nullptr || !std::isnan(*cell.asDouble()); }

// Of a row of ReportData::running.
PlayChange storedChange(const ValueArray& cells) {
  PlayChange change;
  change.time = cells[2].number();
  if (isKnown(cells[3])) change.isRunning = cells[3].boolean();
  if (isKnown(cells[4])) change.volume = std::clamp(cells[4].number(), 0.0, 1.0);
  if (isKnown(cells[5])) change.device = cells[5].text();
  if (isKnown(cells[6])) change.ringer = cells[6].boolean();
  return change;
}

// A stretch that has begun; its end is not known yet.
struct OpenStretch {
  double started;
  PlayChange state;
};

ValueArray rowOf(const OpenStretch& open, double ended) {
  const PlayChange& state = open.state;
  return ValueArray{open.started, ended, state.volume.value_or(kUnknown), state.device.value_or(""),
                    state.ringer.value_or(false) ? 1 : 0};
}

}  // namespace

PlayChange PlayChange::of(const ValueMap& payload, double time) {
  PlayChange change;
  change.time = time;
  if (payload.contains(kRunning)) change.isRunning = payload.boolean(kRunning);
  if (payload.contains(kVolume)) change.volume = std::clamp(payload.number(kVolume), 0.0, 1.0);
  if (payload.contains(kDevices)) change.device = payload.text(kDevices);
  if (payload.contains(kRinger)) change.ringer = payload.boolean(kRinger);
  return change;
}

void LiveSessions::list(const std::vector<ValueMap>& sessions, double now, const Asked& asked) {
  std::vector<Session> listed;
  leftOut_ = 0;
  for (const ValueMap& found : sessions) {
    if (!found.boolean(kWatchKeyStarted) || found.boolean(kWatchKeySingleMessageSession)) continue;
    const std::int64_t process = found.integer(kWatchKeyProcessIdentifier);
    const std::int64_t reporter = found.integer(kWatchKeyReporterID);
    const double seconds = found.number(kWatchKeySeconds);
    const auto ran = std::chrono::duration_cast<std::chrono::steady_clock::duration>(
        std::chrono::duration<double>(std::clamp(seconds, 0.0, kMostSeconds)));
    // The daemon has counted the seconds after `asked.from` and before `asked.until`. A session that surely
    // began later than the known one is another one with the same identifier.
    const auto known = std::find_if(sessions_.begin(), sessions_.end(), [&](const Session& one) {
      return !one.ended && one.process == process && one.reporter == reporter &&
             asked.from - ran <= one.startedBefore + kRounding;
    });
    if (known == sessions_.end() && listed.size() >= kMostSessions) {
      ++leftOut_;
      continue;
    }
    Session session;
    if (known != sessions_.end()) {
      session = std::move(*known);
      sessions_.erase(known);
      session.startedBefore = std::min(session.startedBefore, asked.until - ran);
    } else {
      session.process = process;
      session.reporter = reporter;
      session.started = now - seconds;
      session.startedBefore = asked.until - ran;
    }
    session.service = found.text(kWatchKeyServiceName);
    session.application = found.text(kWatchKeyApplication);
    session.processName = found.text(kWatchKeyProcessName);
    listed.push_back(std::move(session));
  }
  for (Session& gone : sessions_) {
    if (!gone.ended) gone.ended = now;
    if (now - *gone.ended < kKeptSeconds && listed.size() < 2 * kMostSessions)
      listed.push_back(std::move(gone));
  }
  sessions_ = std::move(listed);
  for (EarlyMessage& message : std::exchange(early_, {})) {
    if (Session* session = find(message.reporter, message.application))
      add(*session, std::move(message.change));
  }
}

void LiveSessions::take(const ValueMap& message, double now) {
  const Value* payload = message.find(kWatchKeyPayload);
  if (payload == nullptr || payload->asMap() == nullptr) return;
  double time = message.number(kWatchKeyTime);
  if (!(std::abs(time - now) < kMostLate)) time = now;
  PlayChange change = PlayChange::of(*payload->asMap(), time);
  const std::int64_t reporter = message.integer(kWatchKeyReporterID);
  std::string application = message.text(kWatchKeyApplication);
  if (!change.saysAnything()) return;
  if (Session* session = find(reporter, application)) return add(*session, std::move(change));
  if (early_.size() >= kMostChanges) early_.pop_front();
  early_.push_back({reporter, std::move(application), std::move(change)});
}

void LiveSessions::remember(const ValueMap& rows, double watchedSince) {
  const Value* list = rows.find("rows");
  if (list == nullptr || list->asArray() == nullptr) return;
  for (Session& session : sessions_) {
    if (session.ended) continue;
    std::deque<PlayChange> said;
    for (const Value& row : *list->asArray()) {
      const ValueArray* cells = row.asArray();
      if (cells == nullptr || cells->size() < kStoredCells || (*cells)[0].integer() != session.reporter ||
          std::abs((*cells)[1].number() - session.started) > kSameStart) {
        continue;
      }
      // The store may not know it yet.
      const std::string application = isKnown((*cells)[7]) ? (*cells)[7].text() : "";
      if (!application.empty() && !session.application.empty() && application != session.application)
        continue;
      PlayChange change = storedChange(*cells);
      if (change.time < watchedSince && said.size() < kMostChanges) said.push_front(std::move(change));
    }
    // Changes beyond kMostChanges are merged into the base, which may be newer than all that is stored.
    if (said.empty() || session.base.time >= watchedSince) continue;
    std::deque<PlayChange> all = std::exchange(session.changes, {});
    std::erase_if(all, [&](const PlayChange& change) { return change.time < watchedSince; });
    session.base = {};
    for (PlayChange& change : said) add(session, std::move(change));
    for (PlayChange& change : all) add(session, std::move(change));
  }
}

void LiveSessions::forgetSessions() {
  sessions_.clear();
  leftOut_ = 0;
}

// Two clients may use the same identifier at the same time. A message without an application belongs to the
// session with its identifier that came first; one of an application to no session of another one.
LiveSessions::Session* LiveSessions::find(std::int64_t reporter, const std::string& application) {
  Session* found = nullptr;
  for (Session& session : sessions_) {
    if (session.ended || session.reporter != reporter) continue;
    if (session.application == application) return &session;
    if (found == nullptr && application.empty()) found = &session;
  }
  return found;
}

void LiveSessions::add(Session& session, PlayChange change) {
  auto place = session.changes.end();
  while (place != session.changes.begin() && std::prev(place)->time > change.time) --place;
  session.changes.insert(place, std::move(change));
  if (session.changes.size() <= kMostChanges) return;
  session.base.time = session.changes.front().time;
  merge(session.base, session.changes.front());
  session.changes.pop_front();
}

ValueArray LiveSessions::stretchesOf(const Session& session) {
  std::vector<Value> rows;
  PlayChange state = session.base;
  std::optional<OpenStretch> open;
  if (state.isRunning.value_or(false)) open = OpenStretch{state.time, state};
  for (const PlayChange& change : session.changes) {
    PlayChange next = state;
    merge(next, change);
    const bool runs = next.isRunning.value_or(false);
    const bool differs =
        next.volume != state.volume || next.device != state.device || next.ringer != state.ringer;
    state = std::move(next);
    if (open && runs && !differs) continue;
    if (open && change.time > open->started) rows.emplace_back(rowOf(*open, change.time));
    open.reset();
    if (runs) open = OpenStretch{change.time, state};
  }
  if (open) rows.emplace_back(rowOf(*open, session.ended.value_or(kUnknown)));
  return ValueArray(std::move(rows));
}

ValueArray LiveSessions::toValues() const {
  std::vector<Value> all;
  for (const Session& session : sessions_) {
    all.emplace_back(ValueMap{{"reporter", session.reporter},
                              {"process", session.process},
                              {"processName", session.processName},
                              {"service", session.service},
                              {"application", session.application},
                              {"started", session.started},
                              {"ended", session.ended.value_or(kUnknown)},
                              {"stretches", stretchesOf(session)}});
  }
  return ValueArray(std::move(all));
}

}  // namespace tonewerk
