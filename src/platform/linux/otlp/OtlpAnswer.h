// SPDX-License-Identifier: Apache-2.0
#pragma once

#include <cstdint>
#include <optional>
#include <string>
#include <string_view>

namespace tonewerk {

// An endpoint's answer to a request that it accepted.
struct OtlpAnswer {
  std::int64_t rejectedRecords = 0;
  std::string message;  // may be empty

  friend bool operator==(const OtlpAnswer&, const OtlpAnswer&) = default;
};

// Parses the body of an answer; none if it is not such an answer. An empty body rejects no records.
[[nodiscard]] std::optional<OtlpAnswer> parseOtlpAnswer(std::string_view body);

// Makes text from another host safe for a log line: cuts it after 200 bytes and replaces all bytes that are
// not printable ASCII.
std::string quotable(std::string_view text);

}  // namespace tonewerk
