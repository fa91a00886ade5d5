// SPDX-License-Identifier: Apache-2.0
#pragma once

#include <cstddef>
#include <iterator>

#include "session/KeptPayloads.h"
#include "session/TWReportingSessionMessage.h"
#include "values/IndexIterator.h"
#include "values/PieceVector.h"
#include "values/Prefetch.h"

namespace tonewerk {

// The messages that a session keeps, in little more memory than their values take.
//
// An element is a pointer to a message, which stays valid until sortByTime() or clear(). The messages may be
// changed through it. Payloads that others share live on after clear(). One thread.
class KeptMessages {
 public:
  // So many payloads are shared with the message that was added, not copied to memory of their own: those of
  // few messages take less memory than a chunk.
  static constexpr std::size_t kFewMessages = 512;

  // Adds a copy of the message.
  TWReportingSessionMessage& add(const TWReportingSessionMessage& message);
  // Sorts by epochTime(), ascending and stable. A time that is not a number counts as 0. Returns false when
  // all were in order.
  bool sortByTime();
  // Frees all memory that nobody else holds.
  void clear();

  // Returns an upper bound of the bytes that add(message) takes: nothing for a payload in a chunk that is
  // there, a whole region for one that opens it.
  std::size_t bytesFor(const TWReportingSessionMessage& message) const;

  // Asks the processor for the memory that add() writes.
  void prefetchNext() const {
    if (!empty()) prefetch(back());
    payloads_.prefetchNext();
  }

  std::size_t size() const { return messages_.size(); }
  bool empty() const { return size() == 0; }
  TWReportingSessionMessage* operator[](std::size_t place) const { return &messages_[place]; }
  TWReportingSessionMessage* front() const { return (*this)[0]; }
  TWReportingSessionMessage* back() const { return (*this)[size() - 1]; }

  using Iterator = IndexIterator<KeptMessages>;
  using const_iterator = Iterator;
  using value_type = TWReportingSessionMessage*;
  Iterator begin() const { return {*this, 0}; }
  Iterator end() const { return {*this, size()}; }
  std::reverse_iterator<Iterator> rbegin() const { return std::reverse_iterator(end()); }
  std::reverse_iterator<Iterator> rend() const { return std::reverse_iterator(begin()); }

 private:
  KeptPayloads payloads_;
  PieceVector<TWReportingSessionMessage> messages_;
};

}  // namespace tonewerk
