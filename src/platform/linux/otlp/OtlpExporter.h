// SPDX-License-Identifier: Apache-2.0
#pragma once

#include <chrono>
#include <cstddef>
#include <cstdint>
#include <memory>
#include <string>
#include <thread>

#include "platform/linux/otlp/OtlpLogRecord.h"
#include "platform/linux/otlp/OtlpOutbox.h"
#include "platform/linux/otlp/OtlpSender.h"
#include "platform/linux/otlp/RetryPolicy.h"
#include "values/Mutex.h"

namespace tonewerk {

class Clock;
class HttpClient;
class LogCategory;

// Sends records to one OTLP/HTTP endpoint. It uses a thread of its own, so no other thread waits for the
// network.
//
// Any thread may call add() and flush().
class OtlpExporter {
 public:
  // `url` is the complete URL of the requests, without user, password and query. `ledger` is called on the
  // exporter's thread. The references must outlive the exporter.
  OtlpExporter(std::string url, std::unique_ptr<HttpClient> client, OtlpSender::ResourceSource resource,
               OtlpSender::Ledger ledger, const Clock& clock, const LogCategory& log, RetryPolicy retry,
               const OtlpOutbox::Limits& limits = {});
  OtlpExporter(const OtlpExporter&) = delete;
  OtlpExporter& operator=(const OtlpExporter&) = delete;
  // Cancels a running request and logs how many records are lost.
  ~OtlpExporter();

  // False if there is no room. The record is then dropped and counted.
  [[nodiscard]] bool add(const OtlpLogRecord& record, OtlpOutbox::Urgency urgency);
  // Sends records now that are waiting for a full batch.
  void flush();

  // Any thread. Counts records; see OtlpOutbox::stillSince().
  std::size_t waiting() const { return outbox_.count(); }
  std::uint64_t dropped() const { return outbox_.allDropped(); }
  std::chrono::nanoseconds stillSince() const;
  // Any thread. See OtlpSender::problem().
  std::string problem() const { return sender_.problem(); }

  // Starts the end: the thread sends all waiting records, tries failed ones once more, and then stops.
  void beginEnd();
  // Waits until the thread has done that. False if `deadline` comes first.
  [[nodiscard]] bool waitForEnd(std::chrono::steady_clock::time_point deadline);

 private:
  void run();
  void wake();

  const Clock& clock_;
  const std::unique_ptr<HttpClient> client_;
  OtlpOutbox outbox_;
  OtlpSender sender_;  // used by the thread, and by the destructor after it

  Mutex mutex_;
  Condition changed_;
  bool hasNews_ GUARDED_BY(mutex_) = false;
  bool isEnding_ GUARDED_BY(mutex_) = false;
  bool hasEnded_ GUARDED_BY(mutex_) = false;

  std::thread thread_;  // last: it uses all above
};

}  // namespace tonewerk
