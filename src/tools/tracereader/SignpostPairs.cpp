// SPDX-License-Identifier: Apache-2.0
#include "tools/tracereader/SignpostPairs.h"

#include <algorithm>

namespace tonewerk {

bool SignpostPairs::add(const SignpostEvent& event) {
  const std::size_t name = indexOf(event.name);
  const Key key{name, event.identifier, event.process, event.thread};
  if (event.isBegin) {
    if (openCount_ == kMaxOpen) return false;
    open_[key].push_back(event.nanoseconds);
    ++openCount_;
    return true;
  }
  const auto found = open_.find(key);
  if (found == open_.end()) return true;
  close(found->second, event, name);
  // Otherwise the map would grow with each new identifier.
  if (found->second.empty()) open_.erase(found);
  return true;
}

std::size_t SignpostPairs::indexOf(std::string_view name) {
  const auto found = indices_.find(name);
  if (found != indices_.end()) return found->second;
  names_.emplace_back(name);
  return indices_.emplace(std::string(name), names_.size() - 1).first->second;
}

void SignpostPairs::close(std::vector<std::int64_t>& begins, const SignpostEvent& event, std::size_t name) {
  const std::int64_t nanoseconds = std::max<std::int64_t>(0, event.nanoseconds - begins.back());
  begins.pop_back();
  --openCount_;
  intervals_.push_back({name, static_cast<std::uint64_t>(nanoseconds), event.nanoseconds});
}

}  // namespace tonewerk
