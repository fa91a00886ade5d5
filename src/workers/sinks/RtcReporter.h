// SPDX-License-Identifier: Apache-2.0
#pragma once

#include <atomic>
#include <chrono>
#include <cstdint>
#include <memory>
#include <optional>
#include <string>

#include "platform/LinkReport.h"
#include "protocol/AudioEvent.h"
#include "session/TWReportingSessionMessage.h"

namespace tonewerk {

class Strand;
class Timer;

// Does a real-time-communication worker's work with the reporting service, on the worker's private queue.
// Nothing else uses the service's session.
//
//   start() -> waits for backends, at most kBackendTimeout; the queue is held meanwhile
//           -> sends messages, or logs for each message that the session never started
//   stop()  -> summary, flush, end of the service's session
//
// It lives as long as its queue has work, even when the worker and its session are gone.
class RtcReporter : public std::enable_shared_from_this<RtcReporter> {
 public:
  static constexpr std::chrono::seconds kBackendTimeout{9};

  // What the worker knows about its session when it starts.
  struct Start {
    ValueMap configuration;
    std::string serviceName;
    AudioServiceType serviceType = kServiceUnknown;
    ReporterID reporterID = 0;
    bool isSingleMessageSession = false;
  };

  explicit RtcReporter(std::shared_ptr<Strand> queue);
  ~RtcReporter();

  // Whether the start with this number, counted from 1, has been answered without backends: then neither
  // messages nor a summary are sent until the next one. Any thread.
  bool isSilentSince(std::uint64_t start) const {
    return silentSince_.load(std::memory_order_acquire) == start;
  }

  // Whether a message need not wait for the queue's thread. Any thread.
  bool isQuick() const { return isQuick_.load(std::memory_order_relaxed); }

  // All of these are called on the queue.
  void start(const Start& start);
  void handleMessage(const TWReportingSessionMessage& message);
  // `messages` are copies of the session's messages, made for this call.
  void sendSummary(const TWReportingSessionMessages& messages, AudioServiceType serviceType,
                   ReporterID reporterID);
  void stop();

 private:
  static ValueMap sessionInfoOf(const Start& start, const std::string& token);
  static ValueMap userInfoOf(const Start& start);
  void waitForBackends();
  void takeBackends(std::uint64_t run, const LinkReportSession::Backends& backends);
  void takeTimeout(std::uint64_t run);
  void endWait();
  void resume();
  void sendMessage(const TWReportingSessionMessage& message);

  const std::shared_ptr<Strand> queue_;
  bool linkReportSessionStarted_ = false;
  std::unique_ptr<LinkReportSession> linkReportSession_;
  std::optional<std::string> linkReportAgentToken_;
  std::uint64_t run_ = 0;  // the number of starts; an answer to an earlier start is ignored
  std::atomic<std::uint64_t> silentSince_ = 0;  // the start that found no backends; 0 for none
  std::atomic<bool> isQuick_ = true;
  bool hasAnswer_ = false;
  std::unique_ptr<Timer> timeout_;  // last, because its tick refers to this
};

}  // namespace tonewerk
