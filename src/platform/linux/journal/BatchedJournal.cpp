// SPDX-License-Identifier: Apache-2.0
#include "platform/linux/journal/BatchedJournal.h"

#include <utility>

namespace tonewerk {

std::uint64_t BatchedJournal::append(Kind kind, const Origin& origin, std::string_view bytes) {
  const MutexLock lock(mutex_);
  const std::uint64_t sequence = journal_.append(kind, origin, bytes);
  if (!BatchScope::deferFirst(atEnd_)) (void)journal_.write();
  return sequence;
}

std::uint64_t BatchedJournal::append(const Origin& origin, std::string_view method,
                                     const Arguments& arguments) {
  const MutexLock lock(mutex_);
  const std::uint64_t sequence = journal_.append(origin, method, arguments);
  (void)journal_.write();
  return sequence;
}

bool BatchedJournal::write() {
  const MutexLock lock(mutex_);
  return journal_.write();
}

void BatchedJournal::drop(std::uint64_t before) {
  const MutexLock lock(mutex_);
  journal_.drop(before);
}

void BatchedJournal::clear() {
  const MutexLock lock(mutex_);
  journal_.clear();
}

std::uint64_t BatchedJournal::firstWithin(std::uint64_t bytes) const {
  const MutexLock lock(mutex_);
  return journal_.firstWithin(bytes);
}

std::uint64_t BatchedJournal::last() const {
  const MutexLock lock(mutex_);
  return journal_.last();
}

void BatchedJournal::continueAfter(std::uint64_t sequence) {
  const MutexLock lock(mutex_);
  journal_.continueAfter(sequence);
}

}  // namespace tonewerk
