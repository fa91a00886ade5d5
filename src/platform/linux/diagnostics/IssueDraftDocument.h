// SPDX-License-Identifier: Apache-2.0
#pragma once

#include <optional>
#include <string>

#include "platform/IssueDraftService.h"
#include "platform/linux/diagnostics/collectors/DiagnosticItem.h"

namespace tonewerk {

// Writes the draft of a bug report in Markdown: what happened, where and when, and the list of attached
// files. Names from clients are escaped, so that Markdown shows them unchanged.
struct IssueDraftDocument {
  TrackletDraft draft;
  std::optional<std::string> processName;
  std::string displayReason;

  std::string text(Date requestedAt, const DiagnosticEvidence& evidence) const;
};

}  // namespace tonewerk
