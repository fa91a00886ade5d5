// SPDX-License-Identifier: Apache-2.0
#include "platform/linux/LinuxIssueDraftService.h"

#include <utility>

#include "platform/SerialQueue.h"

namespace tonewerk {

LinuxIssueDraftService::LinuxIssueDraftService(SerialQueueFactory& queues)
    : queue_(queues.makeSerialQueue("com.orvane.tonewerk.issuedrafts", QueuePriority::kUtility)) {}

LinuxIssueDraftService::~LinuxIssueDraftService() = default;

void LinuxIssueDraftService::createDraft(TrackletDraft /*draft*/, std::optional<std::string> /*processName*/,
                                         std::string /*displayReason*/, CompletionHandler completionHandler) {
  queue_->async([handler = std::move(completionHandler)] { handler("drafts are not collected"); });
}

}  // namespace tonewerk
