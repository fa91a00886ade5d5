// SPDX-License-Identifier: Apache-2.0
#pragma once

#include <cstddef>
#include <cstdint>
#include <functional>
#include <optional>
#include <string>
#include <string_view>
#include <utility>

#include "platform/pb/Base.h"

namespace tonewerk::diagwiremetrics {

// Holds the metric record of one detected audio issue; docs/audio_issue_detected.proto describes its form.
class AudioIssueDetected final : public PB::Base {
 public:
  static constexpr std::uint32_t kMetricIdentifier = 0x5B0003;

  [[nodiscard]] bool readFrom(PB::Reader& reader) override;
  void writeTo(PB::Writer& writer) const override;
  void formatText(PB::TextFormatter& formatter, std::string_view name) const override;

  // Hashes the members that == compares.
  std::size_t hash() const;
  void swap(AudioIssueDetected& other) noexcept { std::swap(*this, other); }
  friend void swap(AudioIssueDetected& a, AudioIssueDetected& b) noexcept { a.swap(b); }
  friend bool operator==(const AudioIssueDetected& a, const AudioIssueDetected& b) {
    return a.timestamp == b.timestamp && a.duration == b.duration && a.issuetype == b.issuetype &&
           a.node == b.node && a.rtaidclient == b.rtaidclient;
  }

  std::optional<std::uint64_t> timestamp;  // written only when set
  std::uint32_t duration = 0;              // seconds
  // Byte strings, always written.
  std::string issuetype;
  std::string node;
  std::string rtaidclient;
};

}  // namespace tonewerk::diagwiremetrics

template <>
struct std::hash<tonewerk::diagwiremetrics::AudioIssueDetected> {
  std::size_t operator()(const tonewerk::diagwiremetrics::AudioIssueDetected& record) const {
    return record.hash();
  }
};
