// SPDX-License-Identifier: Apache-2.0
#pragma once

#include <cstdint>
#include <optional>
#include <string>
#include <string_view>

#include "values/EncodedValue.h"
#include "values/PackedMap.h"
#include "values/Value.h"

namespace tonewerk {

// Refers to a value, or to none: to a Value, or to an encoded one in a packed map. It has the conversions and
// the equality of Value, and reads a packed map without making its tree. It is as large as two pointers.
//
// It is valid as long as the map that it came from, unchanged.
class ValueView {
 public:
  ValueView() = default;
  // Null stands for none.
  ValueView(const Value* value) : value_(value) {}
  ValueView(const Value& value) : value_(&value) {}
  ValueView(EncodedValue value) : encoded_(value) {}

  explicit operator bool() const { return value_ != nullptr || encoded_; }
  // What the view refers to; the other one is null.
  const Value* held() const { return value_; }
  EncodedValue encoded() const { return encoded_; }

  // Only for a value that is there.
  Value::Kind kind() const { return value_ != nullptr ? value_->kind() : encoded_.kind(); }
  // Returns the characters of a text, none for any other value.
  std::optional<std::string_view> asText() const;

  // Convert the value as Value does. None is false, 0 or the empty text.
  bool boolean() const;
  std::int64_t integer() const;
  std::int32_t integer32() const;
  double number() const;
  std::string text() const;

  // Returns a Value of its own. An encoded text, array or map is copied. Only for a value that is there.
  Value value() const { return value_ != nullptr ? *value_ : encoded_.value(); }

  // None equals none only.
  friend bool operator==(ValueView a, ValueView b);

 private:
  const Value* value_ = nullptr;
  EncodedValue encoded_;
};

// An entry that a packed map is to get (see ValueMap::setPacked).
struct KeyedView {
  std::string_view key;
  ValueView value;
};

template <typename Visitor>
void ValueMap::forEach(Visitor&& visit) const {
  if (const PackedMap* map = packed()) {
    map->forEach(
        [&](std::size_t slot, EncodedValue value) { visit(map->shape().key(slot), ValueView(value)); });
  } else {
    for (const Entry& entry : *this) visit(entry.key, ValueView(entry.value));
  }
}

}  // namespace tonewerk
