// SPDX-License-Identifier: Apache-2.0
#include "values/Nesting.h"

#include "values/ForEach.h"
#include "values/Value.h"

namespace tonewerk {
namespace {

bool isWithin(ValueView value, std::size_t levels) {
  const Value::Kind kind = value.kind();
  if (kind != Value::Kind::kArray && kind != Value::Kind::kMap) return true;
  bool areWithin = levels > 0;
  if (kind == Value::Kind::kArray) {
    forEachElement(value, [&](ValueView element) { areWithin = areWithin && isWithin(element, levels - 1); });
  } else {
    forEachEntry(value, [&](std::string_view, ValueView held) {
      areWithin = areWithin && isWithin(held, levels - 1);
    });
  }
  return areWithin;
}

}  // namespace

bool nestsWithin(const Value& value, std::size_t levels) { return isWithin(value, levels); }

}  // namespace tonewerk
