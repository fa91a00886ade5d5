// SPDX-License-Identifier: Apache-2.0
#pragma once

#include <cstddef>
#include <string_view>

#include "values/ValueView.h"

namespace tonewerk {

// Visit an array or a map, wherever it lies. A packed map gets no tree.

// Returns how many elements or entries an array or a map has.
inline std::size_t sizeOf(ValueView value) {
  if (value.held() == nullptr) return encoding::extentAt(value.encoded().begin()).count;
  const ValueArray* array = value.held()->asArray();
  return array != nullptr ? array->size() : value.held()->asMap()->size();
}

// Calls visit(ValueView) for each element of an array.
template <typename Visitor>
void forEachElement(ValueView array, Visitor&& visit) {
  if (array.held() == nullptr) {
    forEachElement(array.encoded(), [&](EncodedValue element) { visit(ValueView(element)); });
  } else {
    for (const Value& element : *array.held()->asArray()) visit(ValueView(element));
  }
}

// Calls visit(key, ValueView) for each entry of a map.
template <typename Visitor>
void forEachEntry(ValueView map, Visitor&& visit) {
  if (map.held() == nullptr) {
    forEachEntry(map.encoded(),
                 [&](std::string_view key, EncodedValue value) { visit(key, ValueView(value)); });
  } else {
    map.held()->asMap()->forEach([&](const SharedString& key, ValueView value) { visit(key.view(), value); });
  }
}

}  // namespace tonewerk
