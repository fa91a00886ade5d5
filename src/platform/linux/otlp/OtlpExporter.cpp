// SPDX-License-Identifier: Apache-2.0
#include "platform/linux/otlp/OtlpExporter.h"

#include <algorithm>
#include <utility>

#include "platform/Clock.h"
#include "platform/linux/otlp/HttpClient.h"
#include "platform/linux/threads/ThreadProperties.h"

namespace tonewerk {

OtlpExporter::OtlpExporter(std::string url, std::unique_ptr<HttpClient> client,
                           OtlpSender::ResourceSource resource, OtlpSender::Ledger ledger, const Clock& clock,
                           const LogCategory& log, RetryPolicy retry, const OtlpOutbox::Limits& limits)
    : clock_(clock),
      client_(std::move(client)),
      outbox_(limits),
      sender_(std::move(url), outbox_, *client_, std::move(resource), std::move(ledger), clock, log,
              std::move(retry)),
      thread_([this] { run(); }) {}

OtlpExporter::~OtlpExporter() {
  beginEnd();
  client_->cancel();
  thread_.join();
  sender_.logLosses();
}

bool OtlpExporter::add(const OtlpLogRecord& record, OtlpOutbox::Urgency urgency) {
  const OtlpOutbox::Added added = outbox_.add(otlpJsonOf(record), urgency, clock_.monotonic());
  if (added == OtlpOutbox::Added::kChangedDue) wake();
  return added != OtlpOutbox::Added::kDropped;
}

void OtlpExporter::flush() {
  if (outbox_.flush()) wake();
}

std::chrono::nanoseconds OtlpExporter::stillSince() const { return outbox_.stillSince(clock_.monotonic()); }

void OtlpExporter::beginEnd() {
  (void)outbox_.flush();  // the thread is woken below in any case
  const MutexLock lock(mutex_);
  isEnding_ = true;
  changed_.notifyAll();
}

bool OtlpExporter::waitForEnd(std::chrono::steady_clock::time_point deadline) {
  MutexLock lock(mutex_);
  while (!hasEnded_ && changed_.waitUntil(lock, deadline)) {
  }
  return hasEnded_;
}

void OtlpExporter::wake() {
  const MutexLock lock(mutex_);
  hasNews_ = true;
  changed_.notifyAll();
}

void OtlpExporter::run() {
  nameThisThread("tw-otlp");
  constexpr OtlpOutbox::Time kLongest = std::chrono::hours(1);
  MutexLock lock(mutex_);
  while (!isEnding_) {
    hasNews_ = false;
    lock.unlock();
    const OtlpOutbox::Time wait = std::min(sender_.sendDue().value_or(kLongest), kLongest);
    lock.lock();
    const auto until = std::chrono::steady_clock::now() + wait;
    while (!hasNews_ && !isEnding_ && changed_.waitUntil(lock, until)) {
    }
  }
  lock.unlock();
  sender_.skipRetryDelay();
  sender_.sendDue();
  lock.lock();
  hasEnded_ = true;
  changed_.notifyAll();
}

}  // namespace tonewerk
