// SPDX-License-Identifier: Apache-2.0
#pragma once

#include <memory>
#include <string_view>

#include "session/TWReportingSessionWorkerClass.h"

namespace tonewerk {

// Answers a memory-log message with a snapshot of the device's memory in the log: what two tools say of wired
// and per-process memory and of the kernel's own. At most one every five seconds in the whole process. For
// test sessions and on internal builds.
class TWReportingSessionMemoryLogWorker final : public TWReportingSessionWorkerConsumerProtocol {
 public:
  static const TWReportingSessionWorkerClass kWorkerClass;
  const TWReportingSessionWorkerClass& workerClass() const override { return kWorkerClass; }
  static constexpr bool startOnInit() { return true; }

  [[nodiscard]] static std::shared_ptr<TWReportingSessionMemoryLogWorker> initWithSession(
      const std::shared_ptr<TWReportingSession>& session);

  bool handleRedundantMessages() const override { return true; }

  // Always false. Looks at messages of type MemoryLog only. Blocks the work queue until both tools have
  // ended, which is MemoryLogTool::kLimits.time at the longest: the snapshot is to be that of the message's
  // moment, and in the log before what comes next.
  bool handleMessage(const TWReportingSessionMessage& message) override;

  // Writes the text to the log in numbered blocks of some 512 bytes that end where a line does, if one does.
  // A block that the log does not take has no number.
  static void writeBlocks(std::string_view text);
};

}  // namespace tonewerk
