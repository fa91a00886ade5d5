// SPDX-License-Identifier: Apache-2.0
#pragma once

#include <cstddef>
#include <cstdint>
#include <functional>
#include <limits>
#include <map>
#include <optional>
#include <set>
#include <string>
#include <string_view>
#include <utility>

#include "platform/Journal.h"
#include "platform/JournalPosition.h"
#include "protocol/AudioEvent.h"

namespace tonewerk {

class Clock;
class LogCategory;

// Keeps the requests of all clients in the journal, and knows which of its records are still needed: those
// from the oldest open session on.
//
//   serving    each request is appended before it runs
//   playing    after a crash: the journal's requests run again, and nothing is appended
//
// On the work queue, unless a member says otherwise.
class RequestJournal {
 public:
  // What the journal knows of a connection.
  struct Client {
    std::int32_t process = 0;
    std::uint32_t user = 0;
    std::uint64_t number = 0;  // 0 until it has a record

    friend bool operator==(const Client&, const Client&) = default;
  };

  // Without a journal all members do nothing, and all places are 0. Both references outlive the object.
  RequestJournal(Journal* journal, const Clock& clock) : journal_(journal), clock_(clock) {}
  RequestJournal(const RequestJournal&) = delete;
  RequestJournal& operator=(const RequestJournal&) = delete;

  // From now on as without a journal. Before the first client.
  void turnOff() { journal_ = nullptr; }
  // `watcher` is called after a record was added: after each one while watchNext() holds, and after each one
  // with which the journal has more than the bytes of watchAbove().
  void setWatcher(std::function<void()> watcher) { watcher_ = std::move(watcher); }
  void watchNext(bool watches) { watchesNext_ = watches; }
  void watchAbove(std::uint64_t bytes) { watchedBytes_ = bytes; }

  // Any thread.
  bool isOn() const { return journal_ != nullptr; }

  // Keep a request of the client, and return its number. `frame` is how a socket's client sends it; one that
  // came otherwise is passed as its values.
  std::uint64_t keep(Client& client, std::string_view frame);
  std::uint64_t keep(Client& client, std::string_view method, const Arguments& arguments);
  // Tells who the client is, before its first request that is kept, and again before each new session, so
  // that the older records can go. `name`: of the process. Returns the record's number.
  std::uint64_t keepConnection(Client& client, const std::optional<std::string>& name);
  // A client whose newest record of its connection is before this number tells it again: that record may go,
  // or has gone, before those of sessions that its next request reaches.
  std::uint64_t connectionsNeededFrom() const { return connectionsNeededFrom_; }
  // The connection has ended. 0 when the client has no record.
  std::uint64_t keepEnd(const Client& client);
  // The session of the user's single messages has ended.
  std::uint64_t keepEndOfSingleMessages(std::uint32_t user);

  // A session exists whose first request has that number. An earlier one of that name has gone.
  void opened(const Client& client, ReporterID session, std::uint64_t first);
  void closed(const Client& client, ReporterID session);
  // A session of a user's single messages, likewise. It also needs the connections of those who send to it,
  // which may have been told before. There may be several, of which all but the newest are about to stop.
  void openedSingleMessages(std::uint32_t user, std::uint64_t first);
  void closedSingleMessages(std::uint32_t user, std::uint64_t first);

  // The records before this number are not needed for a session that is open.
  std::uint64_t neededFrom() const;
  // Records before `number` will be dropped, once what came of them is written.
  void willDrop(std::uint64_t number);
  // From now on the sessions that began before `number` do not outlive a crash. Returns how many there are.
  std::size_t uncoverBefore(std::uint64_t number);

  // The request with the number that keep() has just returned.
  JournalPosition position(std::uint64_t number) const { return JournalPosition(number, newestAt_); }

  // While the journal is played: the record whose request runs next.
  void play(const Journal::Record& record);
  void endPlaying() { isPlaying_ = false; }
  bool isPlaying() const { return isPlaying_; }
  // The sessions that were open have been reported, too.
  void endRecovery();
  // While the journal is played, and until then: what runs belongs to the time before the crash, not to now.
  bool isRecovering() const { return isRecovering_; }
  // Call it for each report of a session's stop. How many reports of this name there have been during the
  // recovery, this one included; 0 outside of it. Sessions stop in the order in which they stopped before the
  // crash. So the nth report is there already when there are n of its name.
  std::size_t countReport(const std::string& name);

 private:
  // A client's number and a session's identifier; of a user's single messages the user and the first record.
  struct Name {
    std::uint64_t owner;
    ReporterID session;
    bool isSingle;

    friend auto operator<=>(const Name&, const Name&) = default;  // NOLINT(modernize-use-nullptr): is none
  };

  static Name nameOf(const Client& client, ReporterID session);
  Journal::Origin originOf(const Client& client);
  std::uint64_t added(std::uint64_t number);

  Journal* journal_;
  const Clock& clock_;
  std::uint64_t watchedBytes_ = std::numeric_limits<std::uint64_t>::max();
  bool watchesNext_ = false;
  std::function<void()> watcher_;
  double newestAt_ = 0.0;                 // the time of the newest record, or of the played one
  std::map<Name, std::uint64_t> firsts_;  // of the sessions that are open and covered
  std::set<std::pair<std::uint64_t, Name>> namesByFirst_;  // the same the other way round
  std::uint64_t connectionsNeededFrom_ = 0;
  bool isPlaying_ = false;
  bool isRecovering_ = false;
  std::map<std::string, std::size_t> reports_;  // during the recovery
  std::uint64_t played_ = 0;                    // the number of the record that is played
  std::uint64_t playedClient_ = 0;              // the client's number in it
};

}  // namespace tonewerk
