// SPDX-License-Identifier: Apache-2.0
#pragma once

#include <cstdint>
#include <optional>
#include <string>
#include <string_view>

#include "platform/chanmeter/ChanmeterRecord.h"

namespace tonewerk {

struct ChannelFileProblem {
  std::int64_t code = 0;  // a ChannelFailure
  std::string text;       // with its place: "line 3, column 7: ..." or "/channels/3/value is missing"
};

// One driver's channels as it publishes them, in JSON. See docs/driver-channels.md.
struct ChannelFile {
  // Of a channel whose format is a text that nobody knows.
  static constexpr ChanmeterFormat kUnsupportedFormat = 255;

  std::string driver;
  ChanmeterRecords records;  // as they come

  // None when one thing in `text` is not as it must be; then `problem` is the first. Fields that have no
  // meaning are left alone; of a field given twice the last counts.
  [[nodiscard]] static std::optional<ChannelFile> parse(std::string_view text, ChannelFileProblem& problem);
};

}  // namespace tonewerk
