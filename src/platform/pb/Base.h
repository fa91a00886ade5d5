// SPDX-License-Identifier: Apache-2.0
#pragma once

#include <string_view>

namespace tonewerk::PB {

class Reader;
class Writer;
class TextFormatter;

// A record that has a protocol-buffer form.
class Base {
 public:
  virtual ~Base() = default;

  // Takes the fields that the input holds and leaves the others as they are. Ends at the end of the input, at
  // an end-group key, or at an error: then it is false, and what was read before it stays.
  [[nodiscard]] virtual bool readFrom(Reader& reader) = 0;
  virtual void writeTo(Writer& writer) const = 0;
  virtual void formatText(TextFormatter& formatter, std::string_view name) const = 0;

 protected:
  Base() = default;
  Base(const Base&) = default;
  Base(Base&&) = default;
  Base& operator=(const Base&) = default;
  Base& operator=(Base&&) = default;
};

}  // namespace tonewerk::PB
