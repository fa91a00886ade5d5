// SPDX-License-Identifier: Apache-2.0
#include "values/Nesting.h"

#include <algorithm>

#include "values/Value.h"

namespace tonewerk {

bool nestsWithin(const Value& value, std::size_t levels) {
  if (const ValueArray* array = value.asArray()) {
    return levels > 0 && std::all_of(array->begin(), array->end(),
                                     [&](const Value& element) { return nestsWithin(element, levels - 1); });
  }
  if (const ValueMap* map = value.asMap()) {
    return levels > 0 && std::all_of(map->begin(), map->end(), [&](const ValueMapEntry& entry) {
             return nestsWithin(entry.value, levels - 1);
           });
  }
  return true;
}

}  // namespace tonewerk
