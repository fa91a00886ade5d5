// SPDX-License-Identifier: Apache-2.0
//
// Reads the input as a value that a client sends, and writes it in each form in which it leaves the daemon:
// as JSON for the store and for files, as an OTLP record, and as text for people. JSON reads back as the same
// value, as far as JSON can express it; a packed map is written like its tree; no text for people can end a
// line or control a terminal.
#include <algorithm>
#include <array>
#include <charconv>
#include <cmath>
#include <cstddef>
#include <cstdint>
#include <cstdlib>
#include <nlohmann/json.hpp>
#include <optional>
#include <string>
#include <string_view>

#include "FuzzInput.h"
#include "platform/linux/json/NlohmannJsonService.h"
#include "platform/linux/messagepack/PackedMapReader.h"
#include "platform/linux/messagepack/RpcValueReader.h"
#include "platform/linux/otlp/OtlpLogRecord.h"
#include "platform/linux/store/JsonCut.h"
#include "values/CompactJson.h"
#include "values/PrintableText.h"
#include "values/ShapeTable.h"
#include "values/Utf8.h"
#include "values/ValueDigest.h"
#include "values/ValueView.h"

namespace tonewerk {
namespace {

bool isWholeNumber(const Value& value) {
  return value.asInteger() != nullptr || value.asUnsigned() != nullptr;
}

// Whether a double that JSON cannot express is anywhere in the value.
bool holdsInexpressible(const Value& value) {
  if (const double* number = value.asDouble()) return !std::isfinite(*number);
  bool holds = false;
  if (const ValueArray* array = value.asArray()) {
    for (const Value& element : *array) holds = holds || holdsInexpressible(element);
  }
  if (const ValueMap* map = value.asMap()) {
    for (const ValueMapEntry& entry : *map) holds = holds || holdsInexpressible(entry.value);
  }
  return holds;
}

// Compares with what was read from JSON, which has texts for dates and one kind of integers.
void expectSame(const Value& value, const Value& read) {
  if (const Date* date = value.asDate()) return expect(read == Value(textOf(*date)));
  if (const ValueArray* array = value.asArray()) {
    expect(read.asArray() != nullptr && read.asArray()->size() == array->size());
    for (std::size_t at = 0; at < array->size(); ++at) expectSame((*array)[at], (*read.asArray())[at]);
    return;
  }
  if (const ValueMap* map = value.asMap()) {
    expect(read.asMap() != nullptr && read.asMap()->size() == map->size());
    const ValueMapEntry* other = read.asMap()->begin();
    for (const ValueMapEntry& entry : *map) {
      expect(other->key == entry.key);
      expectSame(entry.value, other->value);
      ++other;
    }
    return;
  }
  expect(value == read);
  expect(value.kind() == read.kind() || (isWholeNumber(value) && isWholeNumber(read)));
}

void useNumber(double number) {
  const std::string text = textOf(number);
  if (!std::isfinite(number)) return expect(text == "nan" || text == "inf" || text == "-inf");
  double read = 0.0;
  const auto [end, error] = std::from_chars(text.data(), text.data() + text.size(), read);
  expect(error == std::errc() && end == text.data() + text.size() && read == number);
  std::array<char, 400> shortest{};
  const bool isFixed = text.find('e') == std::string::npos;
  const auto last = std::to_chars(shortest.data(), shortest.data() + shortest.size(), number,
                                  isFixed ? std::chars_format::fixed : std::chars_format::scientific);
  expect(text == std::string_view(shortest.data(), last.ptr));
}

void useText(const std::string& text) {
  const std::string shown = printable(text);
  expect(isPrintable(shown) && printable(shown) == shown);
  expect(isPrintable(text) == (shown == text));
  const std::string lines = printableLines(text);
  for (std::string_view rest = lines; !rest.empty();) {
    const std::string_view line = rest.substr(0, rest.find('\n'));
    expect(isPrintable(line));
    rest.remove_prefix(std::min(line.size() + 1, rest.size()));
  }
  const Value value(text);
  expect(!std::isnan(value.number()));
  if (text.find_first_not_of("+-.0123456789eE ") == std::string::npos) {
    expect(value.number() == std::strtod(text.c_str(), nullptr));
  }
}

void use(const Value& value) {
  expect(isUtf8(value.text()));
  if (const double* number = value.asDouble()) useNumber(*number);
  if (const SharedString* text = value.asString()) useText(text->string());
  if (const ValueArray* array = value.asArray()) {
    for (const Value& element : *array) use(element);
  }
  if (const ValueMap* map = value.asMap()) {
    for (const ValueMapEntry& entry : *map) {
      useText(entry.key.string());
      use(entry.value);
    }
  }
}

std::string otlpOf(const ValueMap& map) { return otlpJsonOf({1.5, "01", "event", 7, 4, 1, map, true}); }

void write(const ValueMap& map) {
  const NlohmannJsonService json;
  std::string problem;
  const bool isExpressible = !holdsInexpressible(Value(map));
  const std::string compact = json.compact(map);
  const std::optional<Value> read = json.parse(compact, problem);
  expect(read.has_value() == isExpressible);  // null is no value
  if (read) expectSame(Value(map), *read);
  // Escaping what controls a terminal leaves the JSON what it is.
  if (read) expectSame(Value(map), json.parse(printable(compact), problem).value());
  const std::optional<std::string> pretty = json.pretty(map, problem);
  expect(pretty.has_value() == isExpressible);
  if (pretty) expectSame(Value(map), json.parse(*pretty, problem).value());
  expect(nlohmann::json::accept(otlpOf(map)));
}

// Each entry can be left out of the text.
void writeWithout(const ValueMap& map) {
  const std::string whole = map.text();
  for (const ValueMapEntry& entry : map) {
    std::string less;
    appendCompactJson(less, map, entry.key);
    ValueMap without = map;
    if (!entry.key.empty()) without.erase(entry.key);
    expect(less == without.text());
    if (const std::optional<JsonCut> cut = cutOfEntry(whole, map, entry.key)) {
      expect(std::string(whole).erase(cut->begin, cut->size) == less);
    }
  }
}

void expectLikeTree(const ValueMap& packed, const ValueMap& tree) {
  const NlohmannJsonService json;
  std::string problem;
  std::string treeProblem;
  expect(json.compact(packed) == json.compact(tree));
  expect(json.pretty(packed, problem) == json.pretty(tree, treeProblem) && problem == treeProblem);
  expect(otlpOf(packed) == otlpOf(tree));
  expect(ValueDigest::of(packed) == ValueDigest::of(tree));
  for (const ValueMapEntry& entry : tree) {
    std::string text;
    std::string treeText;
    appendCompactJson(text, packed, entry.key);
    appendCompactJson(treeText, tree, entry.key);
    expect(text == treeText);
  }
}

void read(std::string_view bytes) {
  const std::optional<Value> value = readValue(bytes, ValuePlace::kArgument);
  if (!value) return;
  use(*value);
  write(ValueMap{{"value", *value}});
  if (value->asMap() == nullptr) return;
  const ValueMap& map = *value->asMap();
  write(map);
  writeWithout(map);
  ShapeTable shapes;
  const PackedMapReader::Read packed = PackedMapReader().read(bytes, shapes);
  if (packed.result == PackedMapReader::Result::kPacked) expectLikeTree(packed.map, map);
}

}  // namespace
}  // namespace tonewerk

extern "C" int LLVMFuzzerTestOneInput(const std::uint8_t* data, std::size_t size) {
  tonewerk::read({reinterpret_cast<const char*>(data), size});
  return 0;
}
