// SPDX-License-Identifier: Apache-2.0
#pragma once

#include <cstdint>
#include <string_view>
#include <vector>

#include "platform/chanmeter/ChanmeterRecord.h"
#include "platform/linux/json/JsonTree.h"

namespace tonewerk {

// Remembers where the text of a channel file has its numbers, and to which field of which record each
// belongs. Publishers replace a file by one in which only numbers differ, so that the next text need not be
// parsed: everything between the numbers is compared, and the numbers are read.
class ChannelNumbers {
 public:
  enum class Field : std::uint8_t {
    kIgnored,  // no record has it
    kValue,
    kMinimum,
    kMaximum,
    kTransitions,
    kResidency,
    kDutyCycle,
    kLower,
    kUpper,
    kHits
  };
  // A field of the record at `record`, and of its state or bucket at `element`.
  struct Target {
    std::uint32_t record = 0;
    std::uint32_t element = 0;
    Field field = Field::kIgnored;
  };
  struct Use {
    const JsonTree::Node* number;
    Target target;
  };

  // Remembers no numbers; read() then always returns false.
  ChannelNumbers() = default;
  // `json` was parsed from `text`. `uses` are the nodes that records have, in any order. Remembers nothing if
  // the text has far more numbers than its records use, to bound the memory to three times the text's size.
  ChannelNumbers(std::string_view text, const JsonTree& json, std::vector<Use> uses);

  // Reads a text that has other numbers than `previous` and is otherwise the same. `previous` is the text of
  // the constructor or of the last successful call, and `records` has its records; their numbers are
  // replaced. The result is that of parsing `text` as a whole.
  //
  // Returns false if the text differs elsewhere, or a number does not have the usual form or range of its
  // field. Then the text must be parsed, and neither this object nor `records` may be used any more.
  [[nodiscard]] bool read(std::string_view previous, std::string_view text,
                          std::vector<ChanmeterRecord>& records);

 private:
  struct Number {
    std::uint32_t begin;  // in the previous text
    std::uint32_t end;
    Target target;
  };

  std::vector<Number> numbers_;  // in the order of the text
};

}  // namespace tonewerk
