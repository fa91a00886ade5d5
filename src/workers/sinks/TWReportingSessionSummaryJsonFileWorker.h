// SPDX-License-Identifier: Apache-2.0
#pragma once

#include <memory>
#include <string>

#include "session/TWReportingSessionWorkerClass.h"

namespace tonewerk {

// Writes a stopping session's messages, derived ones included, into a JSON file in the reporting logs
// directory. On internal builds for every session, elsewhere for those of the "test" service.
//
// The messages are taken on the work queue, the file is written on the file sinks' own.
class TWReportingSessionSummaryJsonFileWorker final : public TWReportingSessionWorkerProtocol {
 public:
  static const TWReportingSessionWorkerClass kWorkerClass;
  const TWReportingSessionWorkerClass& workerClass() const override { return kWorkerClass; }

  // Null for a session that gets no file.
  static std::shared_ptr<TWReportingSessionSummaryJsonFileWorker> initWithSession(
      const std::shared_ptr<TWReportingSession>& session);

  void stop() override;

  // "<logs>/Audio/Reporting".
  static std::string TWReportingLogsDirectory();
  // "20261120-101800+0100-77-com.orvane.player-longformaudio.json": the local time, then what the session is.
  static std::string fileNameFor(const TWReportingSession& session);
};

}  // namespace tonewerk
