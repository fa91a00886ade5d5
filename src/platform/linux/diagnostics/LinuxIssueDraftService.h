// SPDX-License-Identifier: Apache-2.0
#pragma once

#include <memory>

#include "platform/IssueDraftService.h"

namespace tonewerk {

class DiagnosticsStore;
class SerialQueue;
class SerialQueueFactory;

// Leaves each draft in the diagnostics store, as a folder of "issue-drafts": as request.json for programs, as
// draft.md for whoever files it. Answered on the store's thread when it is on the disk, or could not be
// written; one that the store refuses, on a queue of the service's own.
class LinuxIssueDraftService final : public IssueDraftService {
 public:
  // Both outlive the service. Destroying the service gives the refusals that are still due; what the store
  // took it answers.
  LinuxIssueDraftService(DiagnosticsStore& store, SerialQueueFactory& queues);
  ~LinuxIssueDraftService() override;

  void createDraft(TrackletDraft draft, std::optional<std::string> processName, std::string displayReason,
                   CompletionHandler completionHandler) override;

 private:
  DiagnosticsStore& store_;
  const std::unique_ptr<SerialQueue> refusals_;
};

}  // namespace tonewerk
