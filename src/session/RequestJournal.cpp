// SPDX-License-Identifier: Apache-2.0
#include "session/RequestJournal.h"

#include <algorithm>
#include <limits>

#include "platform/Clock.h"
#include "platform/JournalProcess.h"

namespace tonewerk {

std::uint64_t RequestJournal::keep(Client& client, std::string_view frame) {
  if (isPlaying_) return played_;
  if (journal_ == nullptr) return 0;
  return added(journal_->append(Journal::Kind::kRequest, originOf(client), frame));
}

std::uint64_t RequestJournal::keep(Client& client, std::string_view method, const Arguments& arguments) {
  if (isPlaying_) return played_;
  if (journal_ == nullptr) return 0;
  return added(journal_->append(originOf(client), method, arguments));
}

std::uint64_t RequestJournal::keepConnection(Client& client, const std::optional<std::string>& name) {
  if (isPlaying_) {
    client.number = playedClient_;
    return played_;
  }
  if (journal_ == nullptr) return 0;
  const std::string bytes = encoded(JournalProcess{client.process, name});
  const std::uint64_t number = journal_->append(Journal::Kind::kConnected, originOf(client), bytes);
  if (client.number == 0) client.number = number;
  return added(number);
}

std::uint64_t RequestJournal::keepEnd(const Client& client) {
  if (isPlaying_) return played_;
  if (journal_ == nullptr || client.number == 0) return 0;
  return added(journal_->append(Journal::Kind::kDisconnected, originOf(client), {}));
}

std::uint64_t RequestJournal::keepEndOfSingleMessages(std::uint32_t user) {
  if (isPlaying_) return played_;
  if (journal_ == nullptr) return 0;
  return added(journal_->append(Journal::Kind::kSingleMessagesEnded, originOf({0, user, 0}), {}));
}

void RequestJournal::opened(const Client& client, ReporterID session, std::uint64_t first) {
  closed(client, session);
  if (first == 0) return;
  const Name name = nameOf(client, session);
  firsts_.emplace(name, first);
  namesByFirst_.emplace(first, name);
  connectionsNeededFrom_ = std::max(connectionsNeededFrom_, first);
}

void RequestJournal::closed(const Client& client, ReporterID session) {
  const auto known = firsts_.find(nameOf(client, session));
  if (known == firsts_.end()) return;
  namesByFirst_.erase({known->second, known->first});
  firsts_.erase(known);
}

void RequestJournal::openedSingleMessages(std::uint32_t user, std::uint64_t first) {
  if (first == 0) return;
  opened({0, user, 0}, static_cast<ReporterID>(first),
         std::clamp<std::uint64_t>(connectionsNeededFrom_, 1, first));
}

void RequestJournal::closedSingleMessages(std::uint32_t user, std::uint64_t first) {
  closed({0, user, 0}, static_cast<ReporterID>(first));
}

std::uint64_t RequestJournal::neededFrom() const {
  return namesByFirst_.empty() ? std::numeric_limits<std::uint64_t>::max() : namesByFirst_.begin()->first;
}

void RequestJournal::willDrop(std::uint64_t number) {
  connectionsNeededFrom_ = std::max(connectionsNeededFrom_, number);
}

std::size_t RequestJournal::uncoverBefore(std::uint64_t number) {
  std::size_t count = 0;
  for (; !namesByFirst_.empty() && namesByFirst_.begin()->first < number; ++count) {
    firsts_.erase(namesByFirst_.begin()->second);
    namesByFirst_.erase(namesByFirst_.begin());
  }
  return count;
}

void RequestJournal::play(const Journal::Record& record) {
  isPlaying_ = true;
  isRecovering_ = true;
  played_ = record.sequence;
  playedClient_ = record.origin.client;
  newestAt_ = record.origin.at;
}

void RequestJournal::endRecovery() {
  isRecovering_ = false;
  reports_.clear();
}

std::size_t RequestJournal::countReport(const std::string& name) {
  return isRecovering_ ? ++reports_[name] : 0;
}

RequestJournal::Name RequestJournal::nameOf(const Client& client, ReporterID session) {
  const bool isSingle = client.number == 0;
  return {isSingle ? client.user : client.number, session, isSingle};
}

Journal::Origin RequestJournal::originOf(const Client& client) {
  newestAt_ = clock_.coarseNow();
  return {newestAt_, client.number, client.user};
}

std::uint64_t RequestJournal::added(std::uint64_t number) {
  if (watcher_ && (watchesNext_ || journal_->bytes() > watchedBytes_)) watcher_();
  return number;
}

}  // namespace tonewerk
