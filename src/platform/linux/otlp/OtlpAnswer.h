// SPDX-License-Identifier: Apache-2.0
#pragma once

#include <cstdint>
#include <optional>
#include <string>
#include <string_view>

namespace tonewerk {

// What an endpoint says about a request that it accepted.
struct OtlpAnswer {
  std::int64_t rejectedRecords = 0;
  std::string message;  // empty when it had nothing to say

  friend bool operator==(const OtlpAnswer&, const OtlpAnswer&) = default;
};

// Out of the answer's JSON; none when it is not such an answer. An empty body accepts everything.
[[nodiscard]] std::optional<OtlpAnswer> parseOtlpAnswer(std::string_view body);

// A stranger's words for a log line: control characters replaced, cut after 200 bytes.
std::string quotable(std::string_view text);

}  // namespace tonewerk
