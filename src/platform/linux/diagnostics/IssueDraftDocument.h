// SPDX-License-Identifier: Apache-2.0
#pragma once

#include <optional>
#include <string>

#include "platform/IssueDraftService.h"
#include "platform/linux/diagnostics/collectors/DiagnosticItem.h"

namespace tonewerk {

// A draft of a bug report as somebody would file it, in Markdown: what happened, where, when, and what lies
// beside it. Names that come from elsewhere are shown as they are, not read as Markdown.
struct IssueDraftDocument {
  TrackletDraft draft;
  std::optional<std::string> processName;
  std::string displayReason;

  std::string text(Date requestedAt, const DiagnosticEvidence& evidence) const;
};

}  // namespace tonewerk
