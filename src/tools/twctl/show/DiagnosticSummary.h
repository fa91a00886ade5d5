// SPDX-License-Identifier: Apache-2.0
#pragma once

#include <optional>
#include <string>
#include <string_view>
#include <utility>
#include <vector>

#include "platform/linux/diagnostics/collectors/DiagnosticItem.h"

namespace tonewerk {

// What a request.json says, in words for people. Much of it comes from clients: nothing in it moves a
// terminal's cursor. What is not there is empty.
struct DiagnosticSummary {
  std::string when;  // RFC 3339
  std::string what;
  std::string why;
  std::string process;
  std::string component;                                      // a draft's
  std::string duration;                                       // a capture's, in seconds
  std::string payload;                                        // compact JSON
  std::vector<std::pair<std::string, std::string>> problems;  // by file

  // None when `text` is no JSON object.
  [[nodiscard]] static std::optional<DiagnosticSummary> read(DiagnosticKind kind, std::string_view text);
};

// One line of JSON; "null" when `text` is no JSON.
std::string compactJson(std::string_view text);

}  // namespace tonewerk
