// SPDX-License-Identifier: Apache-2.0
#pragma once

#include <memory>
#include <string>

#include "session/TWReportingSessionWorkerClass.h"

namespace tonewerk {

// Writes a session's messages, when it stops, into a JSON file in the reporting logs directory, with the
// messages that producers made. On internal builds every session gets a file, elsewhere those of the "test"
// service.
//
// The messages are taken on the work queue. The file is written on the file sinks' own queue, which drops it
// when the disk hangs. After that the directory is kept within its bounds (SummaryDirectory.h).
class TWReportingSessionSummaryJsonFileWorker final : public TWReportingSessionWorkerProtocol {
 public:
  static const TWReportingSessionWorkerClass kWorkerClass;
  const TWReportingSessionWorkerClass& workerClass() const override { return kWorkerClass; }

  // Null for a session that gets no file.
  static std::shared_ptr<TWReportingSessionSummaryJsonFileWorker> initWithSession(
      const std::shared_ptr<TWReportingSession>& session);

  void stop() override;

  // Queues the removal of what an earlier daemon left in the directory unfinished, and of what is too old or
  // too much. For the daemon's start.
  static void tidyDirectory();

  // "<logs>/Audio/Reporting".
  static std::string TWReportingLogsDirectory();
  // "20261120-101800+0100-77-com.orvane.player-longformaudio.json": the local time, then the session's
  // identifier, application and service.
  static std::string fileNameFor(const TWReportingSession& session);
  static bool isWrittenAlready(const std::string& name);
};

}  // namespace tonewerk
