// SPDX-License-Identifier: Apache-2.0
#include "values/PrettyJson.h"

#include <cmath>
#include <concepts>
#include <cstddef>

#include "values/EncodedValue.h"
#include "values/JsonPieces.h"
#include "values/PackedMap.h"
#include "values/Shape.h"

namespace tonewerk {
namespace {

// The functions that write a value return false when JSON cannot express it. The text is then incomplete, and
// problem() names the value.
class PrettyWriter {
 public:
  explicit PrettyWriter(std::string& out) : out_(out) {}

  [[nodiscard]] bool map(const ValueMap& map);
  [[nodiscard]] bool member(std::string_view key, const ValueMap& map);
  std::string problem() const { return place_ + " is " + inexpressible_ + ", which JSON cannot say"; }

 private:
  [[nodiscard]] bool packed(const PackedMap& map);
  [[nodiscard]] bool value(const Value& value);
  [[nodiscard]] bool array(const ValueArray& array);
  [[nodiscard]] bool value(EncodedValue value);
  [[nodiscard]] bool array(EncodedValue array);
  [[nodiscard]] bool map(EncodedValue map);
  [[nodiscard]] bool number(double number);
  template <std::integral Integer>
  [[nodiscard]] bool number(Integer number) {
    out_.number(number);
    return true;
  }

  void open(char bracket) {
    out_.add(bracket);
    line_ += "  ";
  }
  void close(char bracket, bool isEmpty) {
    line_.resize(line_.size() - 2);
    if (!isEmpty) startLine(true);
    out_.add(bracket);
  }
  std::string_view line(bool isFirst) const { return std::string_view(line_).substr(isFirst ? 1 : 0); }
  void startLine(bool isFirst) { out_.add(line(isFirst)); }
  void key(std::string_view key) {
    out_.text(key);
    out_.add(": ");
  }

  // Prepends `part` to the path of the value that JSON cannot express. Always returns false.
  bool isWithin(std::string_view part) {
    const bool needsDot = !place_.empty() && place_.front() != '[';
    place_ = std::string(part) + (needsDot ? "." : "") + place_;
    return false;
  }
  bool isWithin(std::size_t index) { return isWithin("[" + std::to_string(index) + "]"); }

  JsonPieces out_;
  std::string line_ = ",\n";   // how each line of this level begins; the first line has no comma
  std::string place_;          // path such as "a.b[2]"
  std::string inexpressible_;  // the value: "nan" or an infinity
};

bool PrettyWriter::member(std::string_view key, const ValueMap& map) {
  open('{');
  startLine(true);
  this->key(key);
  if (!this->map(map)) return isWithin(key);
  close('}', false);
  return true;
}

bool PrettyWriter::map(const ValueMap& map) {
  if (const PackedMap* held = map.packed()) return packed(*held);
  open('{');
  for (const ValueMap::Entry& entry : map) {
    startLine(&entry == map.begin());
    key(entry.key);
    if (!value(entry.value)) return isWithin(entry.key);
  }
  close('}', map.empty());
  return true;
}

bool PrettyWriter::packed(const PackedMap& map) {
  open('{');
  bool isWritten = true;
  map.forEach([&](std::size_t slot, EncodedValue held) {
    if (!isWritten) return;
    out_.add(line(slot == 0), map.shape().json(slot).substr(1), ' ');  // the key without its comma
    isWritten = value(held) || isWithin(map.shape().key(slot));
  });
  if (isWritten) close('}', map.size() == 0);
  return isWritten;
}

bool PrettyWriter::value(const Value& value) {
  if (const SharedString* text = value.asString()) {
    out_.text(*text);
    return true;
  }
  if (const double* number = value.asDouble()) return this->number(*number);
  if (const ValueMap* map = value.asMap()) return this->map(*map);
  if (const ValueArray* array = value.asArray()) return this->array(*array);
  out_.scalar(value);
  return true;
}

bool PrettyWriter::array(const ValueArray& array) {
  open('[');
  std::size_t index = 0;
  for (const Value& element : array) {
    startLine(index == 0);
    if (!value(element)) return isWithin(index);
    ++index;
  }
  close(']', index == 0);
  return true;
}

bool PrettyWriter::value(EncodedValue value) {
  if (value.isNumber()) return encoding::visitNumber(value.begin(), [&](auto held) { return number(held); });
  if (value.isText()) {
    out_.text(value.text());
    return true;
  }
  const Value::Kind kind = value.kind();
  if (kind == Value::Kind::kArray) return array(value);
  if (kind == Value::Kind::kMap) return map(value);
  out_.scalar(value.scalar());
  return true;
}

bool PrettyWriter::array(EncodedValue array) {
  open('[');
  std::size_t index = 0;
  bool isWritten = true;
  forEachElement(array, [&](EncodedValue element) {
    if (!isWritten) return;
    startLine(index == 0);
    isWritten = value(element) || isWithin(index);
    ++index;
  });
  if (isWritten) close(']', index == 0);
  return isWritten;
}

bool PrettyWriter::map(EncodedValue map) {
  open('{');
  bool isFirst = true;
  bool isWritten = true;
  forEachEntry(map, [&](std::string_view key, EncodedValue held) {
    if (!isWritten) return;
    startLine(isFirst);
    isFirst = false;
    this->key(key);
    isWritten = value(held) || isWithin(key);
  });
  if (isWritten) close('}', isFirst);
  return isWritten;
}

bool PrettyWriter::number(double number) {
  if (!std::isfinite(number)) {
    inexpressible_ = textOf(number);
    return false;
  }
  out_.number(number);
  return true;
}

// Writes with write(PrettyWriter&), and takes everything back when that fails.
template <typename Write>
bool append(std::string& out, std::string& problem, Write write) {
  const std::size_t before = out.size();
  {
    PrettyWriter writer(out);
    if (write(writer)) return true;
    problem = writer.problem();
  }
  out.resize(before);
  return false;
}

}  // namespace

bool appendPrettyJson(std::string& out, const ValueMap& map, std::string& problem) {
  return append(out, problem, [&](PrettyWriter& writer) { return writer.map(map); });
}

bool appendPrettyJson(std::string& out, std::string_view member, const ValueMap& map, std::string& problem) {
  return append(out, problem, [&](PrettyWriter& writer) { return writer.member(member, map); });
}

}  // namespace tonewerk
