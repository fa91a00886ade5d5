// SPDX-License-Identifier: Apache-2.0
#include "client/ReplyTable.h"

#include <algorithm>
#include <utility>

namespace tonewerk {

std::uint32_t ReplyTable::add(Entry entry) {
  // A session may run for so long that all numbers were used once. 0 stands for none.
  while (next_ == 0 || entries_.contains(next_)) ++next_;
  entries_.emplace(next_, std::move(entry));
  return next_++;
}

std::optional<ReplyTable::Entry> ReplyTable::take(std::uint32_t identifier) {
  auto node = entries_.extract(identifier);
  if (node.empty()) return std::nullopt;
  return std::move(node.mapped());
}

std::vector<ReplyTable::Entry> ReplyTable::takeAll() {
  std::vector<std::uint32_t> identifiers;
  identifiers.reserve(entries_.size());
  for (const auto& entry : entries_) identifiers.push_back(entry.first);
  std::sort(identifiers.begin(), identifiers.end());
  std::vector<Entry> all;
  all.reserve(identifiers.size());
  for (const std::uint32_t identifier : identifiers) all.push_back(std::move(entries_.at(identifier)));
  entries_.clear();
  next_ = 1;
  return all;
}

bool ReplyTable::hasAwaited() const {
  return std::any_of(entries_.begin(), entries_.end(), [](const auto& entry) {
    return !entry.second.isStart && !entry.second.reply.mayBeHeld;
  });
}

}  // namespace tonewerk
