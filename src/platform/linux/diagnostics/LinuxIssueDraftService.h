// SPDX-License-Identifier: Apache-2.0
#pragma once

#include <memory>

#include "platform/IssueDraftService.h"

namespace tonewerk {

class DiagnosticsStore;
class SerialQueue;
class SerialQueueFactory;

// Writes each draft to the diagnostics store, as a folder of "issue-drafts" with request.json for programs
// and draft.md for people. The completion handler is called on the store's thread after the draft was written
// or could not be written. If the store refuses a draft, the handler is called on the service's own queue.
class LinuxIssueDraftService final : public IssueDraftService {
 public:
  // Both must outlive the service. The destructor calls the outstanding handlers of refused drafts. The
  // handlers of drafts that the store accepted are called by the store.
  LinuxIssueDraftService(DiagnosticsStore& store, SerialQueueFactory& queues);
  ~LinuxIssueDraftService() override;

  void createDraft(TrackletDraft draft, std::optional<std::string> processName, std::string displayReason,
                   CompletionHandler completionHandler) override;

 private:
  DiagnosticsStore& store_;
  const std::unique_ptr<SerialQueue> refusals_;
};

}  // namespace tonewerk
