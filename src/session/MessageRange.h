// SPDX-License-Identifier: Apache-2.0
#pragma once

#include <cstddef>
#include <vector>

#include "session/KeptMessages.h"
#include "session/TWReportingSessionMessage.h"
#include "values/IndexIterator.h"

namespace tonewerk {

// Refers to messages that somebody else owns: those that a session keeps, or records. As in those, an element
// is a pointer to a message. Valid until the owner adds or removes messages.
class MessageRange {
 public:
  MessageRange(const KeptMessages& messages)
      : MessageRange(&messages, messages.size(), [](const void* all, std::size_t place) {
          return (*static_cast<const KeptMessages*>(all))[place];
        }) {}
  MessageRange(const TWReportingSessionMessages& records)
      : MessageRange(&records, records.size(), [](const void* all, std::size_t place) {
          return (*static_cast<const TWReportingSessionMessages*>(all))[place].get();
        }) {}

  std::size_t size() const { return size_; }
  bool empty() const { return size_ == 0; }
  TWReportingSessionMessage* operator[](std::size_t place) const { return at_(all_, place); }

  using Iterator = IndexIterator<MessageRange>;
  Iterator begin() const { return {*this, 0}; }
  Iterator end() const { return {*this, size_}; }

 private:
  using At = TWReportingSessionMessage* (*)(const void* all, std::size_t place);
  MessageRange(const void* all, std::size_t size, At at) : all_(all), size_(size), at_(at) {}

  const void* all_;
  std::size_t size_;
  At at_;
};

// Returns the places of the messages in the order of their epochTime(), ascending and stable. A time that is
// not a number counts as 0. Empty when the messages are in that order already.
std::vector<std::size_t> placesByTime(MessageRange messages);

}  // namespace tonewerk
