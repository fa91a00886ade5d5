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

// The source of an item of the diagnostics store.
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

// The collectors' results.
struct DiagnosticEvidence {
  std::vector<DiagnosticFile> files;
  // The names of files that are missing or incomplete, each with the reason.
  std::vector<std::pair<std::string, std::string>> problems;
};

// A request for diagnostics, to be written to the disk.
struct DiagnosticItem {
  DiagnosticKind kind = DiagnosticKind::kCapture;
  // The folder's name; if it is empty, the folder is named after the time. See
  // DiagnosticsDirectory::isPlainName().
  std::string name = {};
  // The contents of request.json; the store adds "requestedAt", "collected" and "problems".
  ValueMap request = {};
  // Makes one more file from the evidence; may be empty. Called on the store's thread.
  std::function<DiagnosticFile(Date requestedAt, const DiagnosticEvidence&)> describe = {};
};

}  // namespace tonewerk
