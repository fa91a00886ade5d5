// SPDX-License-Identifier: Apache-2.0
#pragma once

#include <cstddef>
#include <cstdint>
#include <memory>
#include <vector>

#include "protocol/AudioEvent.h"
#include "values/ShapeTable.h"
#include "values/ValueView.h"

namespace tonewerk {

// A key whose place the shapes of all clients' messages know.
enum class KnownKey : std::uint8_t { kTimestamp, kApplicationName, kSessionDuration, kIssueType };

// Returns the value of a known key, or none. Reads any map, those of clients' messages without a look-up.
ValueView knownValue(const ValueMap& message, KnownKey key);

// The shapes of one client's messages. Used on the work queue.
class MessageShapes final : public ShapeTable {
 public:
  MessageShapes();

  // Returns the shape of messages of `shape` that have got the tag of their category and type and, when that
  // is not null, the application's name. Null where extended() returns it.
  const Shape* completed(const Shape& shape, AudioEventCategory category, AudioEventType type,
                         const SharedString* applicationName);

 private:
  static constexpr std::size_t kFewestRemembered = 8;
  static constexpr std::size_t kMostRemembered = 256;

  // An answer that was given.
  struct Completion {
    const Shape* shape = nullptr;
    AudioEventCategory category = 0;
    AudioEventType type = 0;
    bool isNamed = false;
    SharedString applicationName;
    const Shape* completed = nullptr;
  };

  // The place for an answer about a message of this kind.
  Completion& placeOf(const Shape& shape, AudioEventCategory category, AudioEventType type);

  // Each in the place that its shape and kind give. A later one takes the place of an earlier one, but first
  // there are more places, up to kMostRemembered.
  std::vector<Completion> remembered_ = std::vector<Completion>(kFewestRemembered);
};

// Makes the table for one client.
inline std::shared_ptr<MessageShapes> makeMessageShapes() { return std::make_shared<MessageShapes>(); }

// Sets an entry that all messages of the same shape get with the same value. A packed map stays packed where
// that is possible; `shapes` are those of its client, or null.
inline void setForAll(ValueMap& message, const ValueMapEntry& entry, ShapeTable* shapes) {
  const Shape* shape = shapes == nullptr ? nullptr : message.shape();
  const Shape* extended = shape == nullptr ? nullptr : shapes->extended(*shape, {entry});
  if (extended == nullptr || !message.extend(*extended)) message.set(entry.key, entry.value);
}

}  // namespace tonewerk
