// SPDX-License-Identifier: Apache-2.0
#include "recovery/SessionRecovery.h"

#include <chrono>
#include <utility>

#include "platform/Log.h"
#include "platform/SinkStatus.h"
#include "platform/linux/journal/BatchedJournal.h"
#include "platform/linux/journal/JournalPlayer.h"
#include "platform/linux/journal/RecoveryAttempts.h"
#include "platform/linux/store/ReportStore.h"
#include "service/TWReportingService.h"
#include "session/RequestJournal.h"
#include "session/TWReportingContext.h"

namespace tonewerk {

bool SessionRecovery::begin(std::optional<StoreMarks> marks) {
  if (!marks) marks.emplace();
  for (const auto& [user, row] : *marks) parts_.journal.continueAfter(row.sequence);
  if (parts_.journal.bytes() == 0) return false;
  parts_.attempts.begin();
  parts_.store.beginPlaying(std::move(*marks));
  return true;
}

void SessionRecovery::play(const Progress& progress) {
  const auto began = std::chrono::steady_clock::now();
  TWReportingService& service = parts_.service;
  RequestJournal& requests = parts_.context.journal();
  JournalPlayer player(
      parts_.journal, service, parts_.accounts,
      {.begins = [&requests](const Journal::Record& record) { requests.play(record); },
       .endSingleMessages = [&service](std::uint32_t user) { service.stopSingleMessageSession(user); },
       .progress = progress});
  const Journal::Reading reading = player.play();
  const std::size_t clients = player.openClients();
  const bool hasOpenSessions = clients > 0 || !service.currentSingleMessageSessions().empty();
  requests.endPlaying();
  parts_.store.endPlaying();
  player.endAll();
  service.stopSingleMessageSessions();
  requests.endRecovery();
  const std::chrono::duration<double> seconds = std::chrono::steady_clock::now() - began;
  if (hasOpenSessions) {
    defaultLog(
        parts_.log,
        "the last daemon did not end in order: sessions of %zu clients recovered from %llu requests in "
        "%f s",
        clients, reading.records, seconds.count());
  }
  if (reading.damagedPlaces > 0) {
    errorLog(parts_.log, "the journal is damaged at %llu places: %llu bytes are left out",
             reading.damagedPlaces, reading.damagedBytes);
  }
}

void SessionRecovery::end() {
  parts_.store.endRecovery();
  parts_.attempts.finish();
}

void SessionRecovery::forget() {
  const bool isLost =
      parts_.store.status().dropped > 0 || parts_.context.fileSinkQueue().status().dropped > 0;
  if (!isLost) parts_.journal.clear();
}

}  // namespace tonewerk
