// SPDX-License-Identifier: Apache-2.0
#pragma once

#include <cstddef>

#include "session/MessageRange.h"
#include "values/Prefetch.h"

namespace tonewerk {

// Calls visit(place, record) for each of a session's messages, in order. When a session stops, most of its
// messages are not in the processor's caches. So this asks for the records and the beginnings of the payloads
// ahead of the visits. The visitor may change a record, but neither add nor remove any.
template <typename Visitor>
void forEachMessage(MessageRange messages, Visitor&& visit) {
  constexpr std::size_t kRecordsAhead = 16;
  constexpr std::size_t kPayloadsAhead = 8;
  constexpr std::size_t kPayloadBytes = 128;
  const std::size_t count = messages.size();
  for (std::size_t place = 0; place < count; ++place) {
    if (place + kRecordsAhead < count) prefetch(messages[place + kRecordsAhead]);
    if (place + kPayloadsAhead < count) prefetch(messages[place + kPayloadsAhead]->message, kPayloadBytes);
    visit(place, *messages[place]);
  }
}

}  // namespace tonewerk
