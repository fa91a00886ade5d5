// SPDX-License-Identifier: Apache-2.0
#include "service/JournalUpkeep.h"

#include <algorithm>
#include <string>
#include <utility>

#include "platform/Journal.h"
#include "platform/Log.h"
#include "session/TWReportingContext.h"
#include "session/TWReportingUtility.h"

namespace tonewerk {
namespace {

// From this part of the bound on, what is reported is dropped as soon as it is written. Above the bound the
// journal is cut to it.
constexpr std::uint64_t busyPart(std::uint64_t bound) { return bound - bound / 4; }
// After so much more it is looked again.
constexpr std::uint64_t lookPart(std::uint64_t bound) { return bound / 16; }

}  // namespace

JournalUpkeep::JournalUpkeep(Journal& journal, TWReportingContext& context, Reports reports,
                             std::function<Bounds()> bounds)
    : journal_(journal),
      context_(context),
      reports_(std::move(reports)),
      readBounds_(std::move(bounds)),
      bounds_(readBounds_()),
      syncing_(
          context.platform().queues.makeSerialQueue("com.orvane.tonewerk.journal", QueuePriority::kUtility)) {
  context_.journal().setWatcher([this] { recordAdded(); });
  context_.journal().watchNext(true);
  watchSize();
}

JournalUpkeep::~JournalUpkeep() {
  isEnding_ = true;
  SerialQueue& queue = context_.reportingServerQueue();
  queue.async([this] {
    timer_.reset();
    context_.journal().setWatcher({});
  });
  // Each may have work of this object, which adds none any more.
  queue.drain();
  syncing_->drain();
  queue.drain();
}

void JournalUpkeep::recordAdded() {
  context_.journal().watchNext(false);
  if (timer_ == nullptr) beginTicks();
  if (journal_.bytes() > bounds_.bytes) {
    makeRoom();
  } else if (journal_.bytes() > busyPart(bounds_.bytes)) {
    tick();
  }
  watchSize();
}

void JournalUpkeep::beginTicks() {
  if (isEnding_) return;
  timer_ = context_.platform().timers.repeat(bounds_.interval, [this] { tick(); });
}

void JournalUpkeep::tick() {
  if (isEnding_) return;
  syncing_->async([this] {
    // The journal logs a failure.
    (void)journal_.sync();
    context_.reportingServerQueue().async([this] { look(); });
  });
}

void JournalUpkeep::look() {
  if (isEnding_) return;
  const std::chrono::seconds interval = bounds_.interval;
  bounds_ = readBounds_();
  if (bounds_.interval != interval && timer_ != nullptr) beginTicks();
  if (journal_.bytes() > bounds_.bytes) {
    makeRoom();
  } else if (journal_.bytes() <= bounds_.bytes / 2) {
    hasUncovered_ = false;
  }
  watchSize();
  if (ticket_) {
    if (!ticket_->isSyncing && isWritten(*ticket_)) bringToDisk();
  } else if (journal_.last() != lookedAt_) {
    makeTicket();
  } else {
    timer_.reset();
    context_.journal().watchNext(true);
  }
}

bool JournalUpkeep::isWritten(const Ticket& ticket) const {
  return ticket.areFilesWritten->load() && reports_.areWritten(ticket.rows);
}

void JournalUpkeep::makeTicket() {
  lookedAt_ = journal_.last();
  const auto areFilesWritten = std::make_shared<std::atomic<bool>>(false);
  ticket_ = Ticket{neededFrom(), reports_.recorded(), areFilesWritten};
  context_.journal().willDrop(ticket_->neededFrom);
  context_.fileSinkQueue().post([areFilesWritten] { *areFilesWritten = true; });
}

void JournalUpkeep::bringToDisk() {
  ticket_->isSyncing = true;
  syncing_->async([this] {
    const bool isOnDisk = reports_.sync();
    context_.reportingServerQueue().async([this, isOnDisk] { drop(isOnDisk); });
  });
}

void JournalUpkeep::drop(bool isOnDisk) {
  if (isEnding_ || !ticket_ || !ticket_->isSyncing) return;
  ticket_->isSyncing = false;
  if (!isOnDisk) return;  // the next tick tries again
  journal_.drop(ticket_->neededFrom);
  ticket_.reset();
  watchSize();
}

// When the journal is to be looked at before the next tick.
void JournalUpkeep::watchSize() {
  const std::uint64_t bytes = journal_.bytes();
  context_.journal().watchAbove(std::max(busyPart(bounds_.bytes), bytes + lookPart(bounds_.bytes)));
}

// Also when the store or a file does not take what was reported: the journal must not grow without bound.
void JournalUpkeep::makeRoom() {
  RequestJournal& journal = context_.journal();
  const std::uint64_t from = journal_.firstWithin(busyPart(bounds_.bytes));
  const std::size_t sessions = journal.uncoverBefore(from);
  journal.willDrop(from);
  ticket_.reset();
  journal_.drop(from);
  if (std::exchange(hasUncovered_, true)) return;
  const std::string what = sessions > 0 ? std::to_string(sessions) + " open sessions, the oldest,"
                                        : "what the sinks have not written";
  errorLog(TWReportingServiceDelegateCategory(),
           "the journal has reached its %llu bytes: %@ would not outlive a crash", bounds_.bytes, what);
}

std::uint64_t JournalUpkeep::neededFrom() const {
  return std::min(context_.journal().neededFrom(), journal_.last() + 1);
}

void JournalUpkeep::dropNow() {
  ticket_.reset();
  const std::uint64_t from = neededFrom();
  if (from > journal_.last()) {
    journal_.clear();
  } else {
    journal_.drop(from);
  }
}

}  // namespace tonewerk
