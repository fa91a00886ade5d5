// SPDX-License-Identifier: Apache-2.0
#include "platform/linux/diagnostics/IssueDraftDocument.h"

#include <string_view>

#include "values/ControlCharacters.h"

namespace tonewerk {
namespace {

// Puts the text on one line and escapes all characters that have a meaning in Markdown or HTML.
std::string plain(std::string_view text) {
  constexpr std::string_view kSpecial = "\\`*_[]<>#|&~";
  std::string out;
  for (const char c : withoutControlCharacters(std::string(text), ' ')) {
    if (kSpecial.find(c) != std::string_view::npos) out += '\\';
    out += c;
  }
  return out;
}

std::string field(std::string_view name, const std::string& value) {
  return "- **" + std::string(name) + ":** " + value + "\n";
}

std::string attachments(const DiagnosticEvidence& evidence) {
  std::string text;
  for (const DiagnosticFile& file : evidence.files) {
    text += "- `" + file.name + "` (" + std::to_string(file.text.size()) + " bytes)\n";
  }
  for (const auto& [file, problem] : evidence.problems) {
    text += "- `" + file + "` is missing or incomplete: " + plain(problem) + "\n";
  }
  return text.empty() ? "Nothing.\n" : text;
}

}  // namespace

std::string IssueDraftDocument::text(Date requestedAt, const DiagnosticEvidence& evidence) const {
  std::string extensions;
  for (const std::string& identifier : draft.diagnosticExtensionIDs) {
    extensions += (extensions.empty() ? "" : ", ") + plain(identifier);
  }
  return "# " + plain(draft.title) + "\n\n" + draft.problemDescription + "\n\n" +
         field("Component", plain(draft.component.name) + ", version " + plain(draft.component.version) +
                                " (" + std::to_string(draft.component.identifier) + ")") +
         field("What happened", plain(displayReason)) + field("When", tonewerk::textOf(requestedAt)) +
         field("Process", processName ? plain(*processName) : "not known") +
         field("Reproducibility", std::to_string(draft.reproducibility)) +
         field("Classification", std::to_string(draft.classification)) +
         field("Diagnostic extensions", extensions.empty() ? "none" : extensions) + "\n## Attached\n\n" +
         attachments(evidence);
}

}  // namespace tonewerk
