// SPDX-License-Identifier: Apache-2.0
#include "support/memory/MemoryJournal.h"

#include <algorithm>
#include <utility>

namespace tonewerk {
namespace {

std::uint64_t bytesOf(const std::map<std::uint64_t, MemoryJournalDisk::Kept>& records) {
  std::uint64_t bytes = 0;
  for (const auto& [sequence, kept] : records) bytes += kept.bytes.size() + 1;
  return bytes;
}

std::string asText(std::string_view method, const Arguments& arguments) {
  std::string text(method);
  for (const Argument& argument : arguments) text += " " + (argument ? argument->text() : "nil");
  return text;
}

}  // namespace

void MemoryJournalDisk::losePower() {
  std::erase_if(records, [](const auto& record) { return !record.second.isSynced; });
}

MemoryJournal::MemoryJournal(std::shared_ptr<MemoryJournalDisk> disk, Encode encode)
    : encode_(encode == nullptr ? asText : encode), disk_(std::move(disk)), last_(disk_->last) {}

void MemoryJournal::fail(Operation operation, std::size_t nth) {
  const MutexLock lock(mutex_);
  Uses& uses = uses_[operation];
  uses.failing = uses.count + nth;
}

void MemoryJournal::failAll(Operation operation) {
  const MutexLock lock(mutex_);
  uses_[operation].allFail = true;
}

void MemoryJournal::heal() {
  const MutexLock lock(mutex_);
  for (auto& [operation, uses] : uses_) uses = {uses.count, 0, false};
}

std::size_t MemoryJournal::uses(Operation operation) const {
  const MutexLock lock(mutex_);
  const auto found = uses_.find(operation);
  return found == uses_.end() ? 0 : found->second.count;
}

bool MemoryJournal::isFailing(Operation operation) {
  Uses& uses = uses_[operation];
  return ++uses.count == uses.failing || uses.allFail;
}

std::uint64_t MemoryJournal::append(Kind kind, const Origin& origin, std::string_view bytes) {
  const MutexLock lock(mutex_);
  ++last_;
  if (!isFailing(Operation::kAppend)) pending_[last_] = {kind, origin, std::string(bytes), false};
  return last_;
}

std::uint64_t MemoryJournal::append(const Origin& origin, std::string_view method,
                                    const Arguments& arguments) {
  return append(Kind::kRequest, origin, encode_(method, arguments));
}

bool MemoryJournal::write() {
  const MutexLock lock(mutex_);
  if (isFailing(Operation::kWrite)) return false;
  if (!pending_.empty()) disk_->last = std::max(disk_->last, pending_.rbegin()->first);
  disk_->records.merge(pending_);
  pending_.clear();
  return true;
}

bool MemoryJournal::sync() {
  const MutexLock lock(mutex_);
  if (isFailing(Operation::kSync)) return false;
  for (auto& [sequence, kept] : disk_->records) kept.isSynced = true;
  return true;
}

Journal::Reading MemoryJournal::read(FunctionRef<bool(const Record&)> visit) {
  std::map<std::uint64_t, MemoryJournalDisk::Kept> records;
  Reading reading;
  {
    const MutexLock lock(mutex_);
    reading = disk_->found;
    if (!isFailing(Operation::kRead)) records = disk_->records;
  }
  for (const auto& [sequence, kept] : records) {
    ++reading.records;
    if (!visit({sequence, kept.kind, kept.origin, kept.bytes})) break;
  }
  return reading;
}

void MemoryJournal::drop(std::uint64_t before) {
  const MutexLock lock(mutex_);
  if (isFailing(Operation::kDrop)) return;
  disk_->records.erase(disk_->records.begin(), disk_->records.lower_bound(before));
}

void MemoryJournal::clear() {
  const MutexLock lock(mutex_);
  if (isFailing(Operation::kDrop)) return;
  pending_.clear();
  disk_->records.clear();
}

std::uint64_t MemoryJournal::firstWithin(std::uint64_t bytes) const {
  const MutexLock lock(mutex_);
  std::map<std::uint64_t, MemoryJournalDisk::Kept> newest = disk_->records;
  newest.insert(pending_.begin(), pending_.end());
  std::uint64_t first = last_ + 1;
  for (; !newest.empty(); newest.erase(std::prev(newest.end()))) {
    const std::uint64_t needed = bytesOf({*newest.rbegin()});
    if (needed > bytes) break;
    bytes -= needed;
    first = newest.rbegin()->first;
  }
  return first;
}

std::uint64_t MemoryJournal::last() const {
  const MutexLock lock(mutex_);
  return last_;
}

void MemoryJournal::continueAfter(std::uint64_t sequence) {
  const MutexLock lock(mutex_);
  last_ = std::max(last_, sequence);
}

std::uint64_t MemoryJournal::bytes() const {
  const MutexLock lock(mutex_);
  return bytesOf(disk_->records) + bytesOf(pending_);
}

}  // namespace tonewerk
