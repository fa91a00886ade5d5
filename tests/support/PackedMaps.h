// SPDX-License-Identifier: Apache-2.0
#pragma once

#include <gtest/gtest.h>
#include <string>
#include <vector>

#include "values/EncodedValue.h"
#include "values/ShapeTable.h"
#include "values/ValueView.h"

namespace tonewerk {

// Returns the entries, which are booleans, numbers and texts, as a packed map.
inline ValueMap packedMapOf(const std::vector<ValueMapEntry>& entries, ShapeTable& shapes) {
  ShapeTable::Place place = ShapeTable::root();
  std::string bytes;
  for (const ValueMapEntry& entry : entries) {
    place = shapes.next(place, entry.key);
    EXPECT_TRUE(appendEncoded(bytes, entry.value));
  }
  ValueMap map(PackedMap::make(*shapes.shapeAt(place), bytes));
  EXPECT_NE(map.packed(), nullptr);
  return map;
}

}  // namespace tonewerk
