// SPDX-License-Identifier: Apache-2.0
#pragma once

#include <cstdint>
#include <memory>
#include <optional>
#include <string>
#include <string_view>
#include <vector>

#include "platform/accounts/Account.h"
#include "platform/chanmeter/ChanmeterRecord.h"
#include "platform/linux/channels/ChannelNumbers.h"

namespace tonewerk {

struct ChannelFileProblem {
  std::int64_t code = 0;  // a ChannelFailure
  std::string text;       // with the position: "line 3, column 7: ..." or "/channels/3/value is missing"
};

// Holds the channels that one driver publishes in a JSON file. docs/driver-channels.md describes the format.
class ChannelFile {
 public:
  // The format of a channel whose "format" field has an unknown text.
  static constexpr ChanmeterFormat kUnsupportedFormat = 255;

  std::string driver;
  ChanmeterRecords records;  // in the order of the file

  // None if `text` does not have the right form; `problem` is then the first error. Unknown fields are
  // ignored. If a field is given twice, the last one counts.
  [[nodiscard]] static std::optional<ChannelFile> parse(std::string_view text, ChannelFileProblem& problem);

  // Reads a text that differs from `previous` in its numbers only, which costs a tenth of parsing it.
  // `previous` is the text of the last successful parse() or update(). The result is that of parse(), with
  // new records. Returns false if the text differs elsewhere or needs parsing. Then this object must not be
  // updated again.
  [[nodiscard]] bool update(std::string_view previous, std::string_view text);

  // The bytes of the records of the last parse() or update(), with their texts, states and buckets.
  std::uint64_t recordBytes() const;
  // Keeps `charge` as long as anyone holds one of these records, for which it may be called once.
  void keep(Charge charge);

 private:
  struct Held;

  std::shared_ptr<Held> held_;  // what `records` point into
  ChannelNumbers numbers_;
};

}  // namespace tonewerk
