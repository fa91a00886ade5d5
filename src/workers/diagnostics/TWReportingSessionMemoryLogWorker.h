// SPDX-License-Identifier: Apache-2.0
#pragma once

#include <memory>
#include <string_view>

#include "session/TWReportingSessionWorkerClass.h"

namespace tonewerk {

// Logs a snapshot of the device's memory when a memory-log message comes. Two tools report wired and
// per-process memory, and the kernel's own memory. The whole process logs at most one snapshot every five
// seconds. The worker exists in test sessions and on internal builds. It lives on the work queue.
class TWReportingSessionMemoryLogWorker final : public TWReportingSessionWorkerConsumerProtocol {
 public:
  static const TWReportingSessionWorkerClass kWorkerClass;
  static constexpr bool kIsForLiveSessions = true;
  const TWReportingSessionWorkerClass& workerClass() const override { return kWorkerClass; }
  static constexpr MessageTypes kHandledTypes = MessageTypes::only(kTypeMemoryLog);
  static constexpr MessageTypes kSlowTypes = kHandledTypes;
  static constexpr bool startOnInit() { return true; }

  [[nodiscard]] static std::shared_ptr<TWReportingSessionMemoryLogWorker> initWithSession(
      const std::shared_ptr<TWReportingSession>& session);

  bool handleRedundantMessages() const override { return true; }

  // Handles messages of type MemoryLog only. Returns false always. Blocks the work queue until both tools
  // have ended, at most for MemoryLogTool::kLimits.time, because the snapshot should show the memory at the
  // time of the message and stand in the log before the next message's lines.
  bool handleMessage(const TWReportingSessionMessage& message) override;

  // Writes the text to the log in numbered blocks. A block ends with the first line end that follows its
  // first 512 bytes. Without such a line end it has exactly 512 bytes. The last block may be shorter. A block
  // that the log does not take gets no number. Any thread may call it.
  static void writeBlocks(std::string_view text);
};

}  // namespace tonewerk
