// SPDX-License-Identifier: Apache-2.0
#pragma once

#include <cstdint>
#include <string_view>

namespace tonewerk::PB {

// Converts a record to text for people: named objects with named fields.
class TextFormatter {
 public:
  virtual ~TextFormatter() = default;

  virtual void beginObject(std::string_view name) = 0;
  virtual void format(std::string_view name, std::uint64_t value) = 0;
  // Takes a byte string, which need not be text.
  virtual void format(std::string_view name, std::string_view value) = 0;
  virtual void endObject() = 0;
};

}  // namespace tonewerk::PB
