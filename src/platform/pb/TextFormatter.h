// SPDX-License-Identifier: Apache-2.0
#pragma once

#include <cstdint>
#include <string_view>

namespace tonewerk::PB {

// Turns a record into text for people: objects with names, fields with names.
class TextFormatter {
 public:
  virtual ~TextFormatter() = default;

  virtual void beginObject(std::string_view name) = 0;
  virtual void format(std::string_view name, std::uint64_t value) = 0;
  // A byte string, which need not be text.
  virtual void format(std::string_view name, std::string_view value) = 0;
  virtual void endObject() = 0;
};

}  // namespace tonewerk::PB
