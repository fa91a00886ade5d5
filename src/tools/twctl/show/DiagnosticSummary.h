// SPDX-License-Identifier: Apache-2.0
#pragma once

#include <optional>
#include <string>
#include <string_view>
#include <utility>
#include <vector>

#include "platform/linux/diagnostics/collectors/DiagnosticItem.h"

namespace tonewerk {

// Holds the content of a request.json as texts for people. Much of it comes from clients, so control
// characters are replaced. Missing fields are empty.
struct DiagnosticSummary {
  std::string when;  // RFC 3339
  std::string what;
  std::string why;
  std::string process;
  std::string component;                                      // for a draft
  std::string duration;                                       // for a capture, in seconds
  std::string payload;                                        // compact JSON
  std::vector<std::pair<std::string, std::string>> problems;  // by file

  // None when `text` is not a JSON object, or nests deeper than any item does (200 levels).
  [[nodiscard]] static std::optional<DiagnosticSummary> read(DiagnosticKind kind, std::string_view text);
};

// `text` as one line of JSON; "null" when it is not JSON, or nests as deep.
std::string compactJson(std::string_view text);

}  // namespace tonewerk
