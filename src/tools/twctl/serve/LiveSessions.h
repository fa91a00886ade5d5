// SPDX-License-Identifier: Apache-2.0
#pragma once

#include <chrono>
#include <cstddef>
#include <cstdint>
#include <deque>
#include <optional>
#include <string>
#include <vector>

#include "values/Value.h"

namespace tonewerk {

// What a message says about playback; none for what it does not say.
struct PlayChange {
  double time = 0.0;  // seconds since 1970
  std::optional<bool> isRunning;
  std::optional<double> volume;
  std::optional<std::string> device;
  std::optional<bool> ringer;

  // From a message's payload.
  static PlayChange of(const ValueMap& payload, double time);
  bool saysAnything() const { return isRunning || volume || device || ringer; }
};

// What plays now, from the daemon's listings of sessions and from the messages that it lets watch: the
// stretches that the daemon will report when a session ends. Used by one thread.
//
//   messages     running, 0.5      0.8        not running
//   stretches    |------ 0.5 ------|--- 0.8 ---|
//
// Bounds: kMostSessions, those that came first; kMostChanges for each session, the newest. Times are seconds
// since 1970.
class LiveSessions {
 public:
  static constexpr std::size_t kMostSessions = 100;
  static constexpr std::size_t kMostChanges = 200;
  // For so long a session is kept after its end, until the store has it.
  static constexpr double kKeptSeconds = 60.0;

  // When a listing was asked for and when it arrived, by a clock that does not jump.
  struct Asked {
    std::chrono::steady_clock::time_point from;
    std::chrono::steady_clock::time_point until;
  };

  // Takes a complete listing of the daemon's sessions. A session that is not in it has ended.
  void list(const std::vector<ValueMap>& sessions, double now, const Asked& asked);
  // Takes a message, one of those in the answer of watch.nextMessages. It is kept until the next listing when
  // its session is not in the last one.
  void take(const ValueMap& message, double now);
  // Takes what the store has of sessions that still run: the rows of ReportData::running. May be called again
  // with newer rows. What is later than `watchedSince`, when the messages began to arrive, is left out.
  void remember(const ValueMap& rows, double watchedSince);
  // Forgets the sessions, because another daemon may have the next ones.
  void forgetSessions();
  // Forgets the messages that wait for their sessions: another daemon's sessions may have the same
  // identifiers.
  void forgetEarly() { early_.clear(); }

  // For the page: an array of maps. A stretch that still grows has no end.
  [[nodiscard]] ValueArray toValues() const;
  // How many sessions there was no room for.
  std::size_t leftOut() const { return leftOut_; }

 private:
  struct Session {
    std::int64_t process = 0;
    std::int64_t reporter = 0;
    std::string service;
    std::string application;
    std::string processName;
    double started = 0.0;  // by the clock of the first listing
    std::chrono::steady_clock::time_point startedBefore;
    std::optional<double> ended;
    PlayChange base;                 // the state before `changes`
    std::deque<PlayChange> changes;  // ordered by time
  };
  struct EarlyMessage {
    std::int64_t reporter;
    std::string application;
    PlayChange change;
  };

  Session* find(std::int64_t reporter, const std::string& application);
  static void add(Session& session, PlayChange change);
  static ValueArray stretchesOf(const Session& session);

  std::vector<Session> sessions_;
  std::deque<EarlyMessage> early_;
  std::size_t leftOut_ = 0;
};

}  // namespace tonewerk
