// SPDX-License-Identifier: Apache-2.0
#pragma once

#include <array>
#include <functional>
#include <string>
#include <string_view>
#include <utility>
#include <vector>

#include "values/Value.h"

namespace tonewerk {

// What an item of the diagnostics store came from.
enum class DiagnosticKind { kCapture, kIssueDraft, kWhirlcap };

inline constexpr std::array kDiagnosticKinds{DiagnosticKind::kCapture, DiagnosticKind::kIssueDraft,
                                             DiagnosticKind::kWhirlcap};

// The directory below the state directory: "captures", "issue-drafts" or "whirlcaps".
constexpr std::string_view directoryNameOf(DiagnosticKind kind) {
  switch (kind) {
    case DiagnosticKind::kCapture:
      return "captures";
    case DiagnosticKind::kIssueDraft:
      return "issue-drafts";
    case DiagnosticKind::kWhirlcap:
      break;
  }
  return "whirlcaps";
}

struct DiagnosticFile {
  std::string name;
  std::string text;
};

// What the collectors gave.
struct DiagnosticEvidence {
  std::vector<DiagnosticFile> files;
  // The names of files that are missing or incomplete, and why.
  std::vector<std::pair<std::string, std::string>> problems;
};

// Something to be left on the disk: a request and what goes with it.
struct DiagnosticItem {
  DiagnosticKind kind = DiagnosticKind::kCapture;
  // The folder's; when it is empty, the time becomes the name. See DiagnosticsDirectory::isPlainName().
  std::string name = {};
  // For request.json; "requestedAt", "collected" and "problems" are added to it.
  ValueMap request = {};
  // Makes one more file of what was collected; may be empty. Runs on the store's thread.
  std::function<DiagnosticFile(Date requestedAt, const DiagnosticEvidence&)> describe = {};
};

}  // namespace tonewerk
