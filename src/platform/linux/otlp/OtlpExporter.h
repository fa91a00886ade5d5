// SPDX-License-Identifier: Apache-2.0
#pragma once

#include <chrono>
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

// Sends records to one OTLP/HTTP endpoint, on a thread of its own: nobody else ever waits for the network.
//
// add() and flush() from any thread.
class OtlpExporter {
 public:
  // `url` as it is posted to. What is referred to outlives it.
  OtlpExporter(std::string url, std::unique_ptr<HttpClient> client, OtlpSender::ResourceSource resource,
               const Clock& clock, const LogCategory& log, RetryPolicy retry,
               const OtlpOutbox::Limits& limits = {});
  OtlpExporter(const OtlpExporter&) = delete;
  OtlpExporter& operator=(const OtlpExporter&) = delete;
  // Breaks off what is being sent, and says what is lost.
  ~OtlpExporter();

  // False when there is no room for it: it is dropped and counted.
  [[nodiscard]] bool add(const OtlpLogRecord& record, OtlpOutbox::Urgency urgency);
  // What waits for its batch goes out now.
  void flush();

  // What waits goes out now, with one more try for what failed before; then nothing more.
  void beginEnd();
  // Until that is done, at most until `deadline`. False when it is not.
  [[nodiscard]] bool waitForEnd(std::chrono::steady_clock::time_point deadline);

 private:
  void run();
  void wake();

  const Clock& clock_;
  const std::unique_ptr<HttpClient> client_;
  OtlpOutbox outbox_;
  OtlpSender sender_;  // the thread's own

  Mutex mutex_;
  Condition changed_;
  bool hasNews_ GUARDED_BY(mutex_) = false;
  bool isEnding_ GUARDED_BY(mutex_) = false;
  bool hasEnded_ GUARDED_BY(mutex_) = false;

  std::thread thread_;  // last: it uses all above
};

}  // namespace tonewerk
