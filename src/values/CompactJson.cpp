// SPDX-License-Identifier: Apache-2.0
#include "values/CompactJson.h"

#include <string_view>
#include <utility>

#include "values/JsonPieces.h"
#include "values/PackedMap.h"
#include "values/Shape.h"

namespace tonewerk {
namespace {

class JsonWriter {
 public:
  explicit JsonWriter(std::string& out) : out_(out) {}

  void value(const Value& value);
  void value(EncodedValue value);
  void map(const ValueMap& map);
  void mapWithout(const ValueMap& map, std::string_view hidden);
  void text(std::string_view text) { out_.text(text); }

 private:
  void packed(const PackedMap& map);

  JsonPieces out_;
};

void JsonWriter::value(const Value& value) {
  if (const SharedString* held = value.asString()) return text(*held);
  if (const ValueMap* held = value.asMap()) return map(*held);
  const ValueArray* array = value.asArray();
  if (array == nullptr) return out_.scalar(value);
  out_.add('[');
  for (const Value& element : *array) {
    if (&element != array->begin()) out_.add(',');
    this->value(element);
  }
  out_.add(']');
}

void JsonWriter::value(EncodedValue value) {
  if (value.isNumber()) return encoding::visitNumber(value.begin(), [&](auto held) { out_.number(held); });
  if (value.isText()) return text(value.text());
  const Value::Kind kind = value.kind();
  const char* separator = "";
  if (kind == Value::Kind::kArray) {
    out_.add('[');
    forEachElement(value, [&](EncodedValue element) {
      out_.add(std::exchange(separator, ","));
      this->value(element);
    });
    out_.add(']');
  } else if (kind == Value::Kind::kMap) {
    out_.add('{');
    forEachEntry(value, [&](std::string_view key, EncodedValue held) {
      out_.add(std::exchange(separator, ","));
      text(key);
      out_.add(':');
      this->value(held);
    });
    out_.add('}');
  } else {
    out_.scalar(value.scalar());
  }
}

void JsonWriter::packed(const PackedMap& map) {
  out_.add('{');
  map.forEach([&](std::size_t slot, EncodedValue held) {
    const std::string_view key = map.shape().json(slot);
    out_.add(slot == 0 ? key.substr(1) : key);  // without the comma
    value(held);
  });
  out_.add('}');
}

void JsonWriter::map(const ValueMap& map) {
  if (const PackedMap* held = map.packed()) return packed(*held);
  out_.add('{');
  for (const ValueMap::Entry& entry : map) {
    if (&entry != map.begin()) out_.add(',');
    text(entry.key);
    out_.add(':');
    value(entry.value);
  }
  out_.add('}');
}

void JsonWriter::mapWithout(const ValueMap& map, std::string_view hidden) {
  out_.add('{');
  bool isFirst = true;
  const auto separate = [&] {
    if (!std::exchange(isFirst, false)) out_.add(',');
  };
  if (const PackedMap* held = map.packed()) {
    const Shape& shape = held->shape();
    held->forEach([&, hiddenSlot = shape.find(hidden)](std::size_t slot, EncodedValue entry) {
      if (slot == hiddenSlot) return;
      separate();
      out_.add(shape.json(slot).substr(1));  // without the comma
      value(entry);
    });
  } else {
    for (const ValueMap::Entry& entry : map) {
      if (entry.key.view() == hidden) continue;
      separate();
      text(entry.key);
      out_.add(':');
      value(entry.value);
    }
  }
  out_.add('}');
}

}  // namespace

void appendCompactJson(std::string& out, ValueView value) {
  JsonWriter writer(out);
  if (value.encoded()) {
    writer.value(value.encoded());
  } else {
    writer.value(*value.held());
  }
}

void appendCompactJson(std::string& out, const ValueMap& map) { JsonWriter(out).map(map); }

void appendCompactJson(std::string& out, const ValueMap& map, std::string_view hidden) {
  if (hidden.empty() || !map.contains(hidden)) return appendCompactJson(out, map);
  JsonWriter(out).mapWithout(map, hidden);
}

void appendJsonText(std::string& out, std::string_view text) { JsonWriter(out).text(text); }

}  // namespace tonewerk
