// SPDX-License-Identifier: Apache-2.0
#pragma once

#include <cstddef>
#include <memory>

#include "session/TWReportingKeys.h"
#include "values/ShapeTable.h"

namespace tonewerk {

// The places of the keys that every shape of a client's messages knows (Shape::known()).
inline constexpr std::size_t kKnownTimestamp = 0;
inline constexpr std::size_t kKnownApplicationName = 1;

// Makes the table for the shapes of one client's messages. Used on the work queue.
inline std::shared_ptr<ShapeTable> makeMessageShapes() {
  return std::make_shared<ShapeTable>(
      std::vector<SharedString>{TWReportingInternalEventEpochTime, TWReportingApplicationName});
}

// Sets an entry that all messages of the same shape get with the same value. A packed map stays packed where
// that is possible; `shapes` are those of its client, or null.
inline void setForAll(ValueMap& message, const ValueMapEntry& entry, ShapeTable* shapes) {
  const Shape* shape = shapes == nullptr ? nullptr : message.shape();
  const Shape* extended = shape == nullptr ? nullptr : shapes->extended(*shape, {entry});
  if (extended == nullptr || !message.extend(*extended)) message.set(entry.key, entry.value);
}

}  // namespace tonewerk
