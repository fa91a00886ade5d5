// SPDX-License-Identifier: Apache-2.0
#pragma once

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

// What a real-time-communication worker does on its private queue: it alone touches the service's session.
//
//   start() -> waits for backends, at most kBackendTimeout; the queue is held meanwhile
//           -> sends, or says of every message that the session never started
//   stop()  -> summary, flush, end of the service's session
//
// Lives on while its queue has work, also when the worker and its session are gone.
class RtcReporter : public std::enable_shared_from_this<RtcReporter> {
 public:
  static constexpr std::chrono::seconds kBackendTimeout{9};

  // What the worker knows of its session when it starts.
  struct Start {
    ValueMap configuration;
    std::string serviceName;
    AudioServiceType serviceType = kServiceUnknown;
    ReporterID reporterID = 0;
    bool isSingleMessageSession = false;
  };

  explicit RtcReporter(std::shared_ptr<Strand> queue);
  ~RtcReporter();

  // All on the queue.
  void start(const Start& start);
  void handleMessage(TWReportingSessionMessage& message);
  // The session's messages as copies of their own.
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
  void sendMessage(TWReportingSessionMessage& message);

  const std::shared_ptr<Strand> queue_;
  bool linkReportSessionStarted_ = false;
  std::unique_ptr<LinkReportSession> linkReportSession_;
  std::optional<std::string> linkReportAgentToken_;
  std::uint64_t run_ = 0;  // starts so far: answers to an earlier one come too late
  bool hasAnswer_ = false;
  std::unique_ptr<Timer> timeout_;  // last: its tick refers to this
};

}  // namespace tonewerk
