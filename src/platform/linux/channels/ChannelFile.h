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
  std::string text;       // with the position: "line 3, column 7: ..." or "/channels/3/value is missing"
};

// Holds the channels that one driver publishes in a JSON file. docs/driver-channels.md describes the format.
struct ChannelFile {
  // The format of a channel whose "format" field has an unknown text.
  static constexpr ChanmeterFormat kUnsupportedFormat = 255;

  std::string driver;
  ChanmeterRecords records;  // in the order of the file

  // None if `text` does not have the right form; `problem` is then the first error. Unknown fields are
  // ignored. If a field is given twice, the last one counts.
  [[nodiscard]] static std::optional<ChannelFile> parse(std::string_view text, ChannelFileProblem& problem);
};

}  // namespace tonewerk
