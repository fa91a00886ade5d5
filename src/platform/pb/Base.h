// SPDX-License-Identifier: Apache-2.0
#pragma once

#include <string_view>

namespace tonewerk::PB {

class Reader;
class Writer;
class TextFormatter;

// A record with a protocol-buffer form.
class Base {
 public:
  virtual ~Base() = default;

  // Sets the fields that the input holds and leaves the others unchanged. Ends at the end of the input, at an
  // end-group key, or at an error. On an error it returns false; fields read before it stay set.
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
