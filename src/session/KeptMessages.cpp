// SPDX-License-Identifier: Apache-2.0
#include "session/KeptMessages.h"

#include <utility>
#include <vector>

#include "session/MessageRange.h"

namespace tonewerk {

TWReportingSessionMessage& KeptMessages::add(const TWReportingSessionMessage& message) {
  TWReportingSessionMessage& added = messages_.add(message);
  if (size() > kFewMessages) added.message = payloads_.keep(message.message);
  return added;
}

std::size_t KeptMessages::bytesFor(const TWReportingSessionMessage& message) const {
  // Twice, because half of the last piece of records may be empty.
  constexpr std::size_t kRecordBytes = 2 * sizeof(TWReportingSessionMessage);
  constexpr std::size_t kDetailsBytes = 160;  // only producers give them
  return kRecordBytes + (message.details.empty() ? 0 : kDetailsBytes) +
         (size() < kFewMessages ? KeptPayloads::heapBytesOf(message.message)
                                : payloads_.bytesFor(message.message));
}

bool KeptMessages::sortByTime() {
  const std::vector<std::size_t> places = placesByTime(*this);
  if (places.empty()) return false;
  PieceVector<TWReportingSessionMessage> sorted;
  for (const std::size_t place : places) sorted.add(std::move(messages_[place]));
  messages_ = std::move(sorted);
  return true;
}

void KeptMessages::clear() {
  messages_.clear();
  payloads_.clear();
}

}  // namespace tonewerk
