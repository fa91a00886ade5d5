// SPDX-License-Identifier: Apache-2.0
#include "platform/linux/diagnostics/LinuxIssueDraftService.h"

#include <utility>

#include "platform/SerialQueue.h"
#include "platform/linux/diagnostics/DiagnosticsStore.h"
#include "platform/linux/diagnostics/IssueDraftDocument.h"

namespace tonewerk {
namespace {

ValueMap requestOf(const TrackletDraft& draft, const std::optional<std::string>& processName,
                   const std::string& displayReason) {
  ValueArray extensions;
  for (const std::string& identifier : draft.diagnosticExtensionIDs) extensions.append(identifier);
  ValueMap request{{"title", draft.title},
                   {"problemDescription", draft.problemDescription},
                   {"component", ValueMap{{"name", draft.component.name},
                                          {"version", draft.component.version},
                                          {"identifier", draft.component.identifier}}},
                   {"reproducibility", draft.reproducibility},
                   {"classification", draft.classification},
                   {"diagnosticExtensionIDs", std::move(extensions)}};
  if (processName) request.set("processName", *processName);
  request.set("displayReason", displayReason);
  return request;
}

}  // namespace

LinuxIssueDraftService::LinuxIssueDraftService(DiagnosticsStore& store, SerialQueueFactory& queues)
    : store_(store),
      refusals_(queues.makeSerialQueue("com.orvane.tonewerk.issuedrafts", QueuePriority::kUtility)) {}

LinuxIssueDraftService::~LinuxIssueDraftService() = default;

void LinuxIssueDraftService::createDraft(TrackletDraft draft, std::optional<std::string> processName,
                                         std::string displayReason, CompletionHandler completionHandler) {
  DiagnosticItem item{DiagnosticKind::kIssueDraft};
  item.request = requestOf(draft, processName, displayReason);
  item.describe =
      [document = IssueDraftDocument{std::move(draft), std::move(processName), std::move(displayReason)}](
          Date requestedAt, const DiagnosticEvidence& evidence) {
        return DiagnosticFile{"draft.md", document.text(requestedAt, evidence)};
      };
  const auto answer = [completionHandler](const std::error_code& error, const std::string&) {
    completionHandler(error ? std::optional(error.message()) : std::nullopt);
  };
  const std::error_code refused = store_.add(std::move(item), answer);
  if (refused)
    refusals_->async([handler = std::move(completionHandler), refused] { handler(refused.message()); });
}

}  // namespace tonewerk
