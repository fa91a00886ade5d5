// SPDX-License-Identifier: Apache-2.0
#pragma once

#include <memory>

#include "platform/IssueDraftService.h"

namespace tonewerk {

class SerialQueue;
class SerialQueueFactory;

// Nothing collects drafts yet: every one is answered with an error, on a queue of the service's own.
class LinuxIssueDraftService final : public IssueDraftService {
 public:
  // `queues` outlives the service. Destroying the service gives the answers that are still due.
  explicit LinuxIssueDraftService(SerialQueueFactory& queues);
  ~LinuxIssueDraftService() override;

  void createDraft(TrackletDraft draft, std::optional<std::string> processName, std::string displayReason,
                   CompletionHandler completionHandler) override;

 private:
  const std::unique_ptr<SerialQueue> queue_;
};

}  // namespace tonewerk
