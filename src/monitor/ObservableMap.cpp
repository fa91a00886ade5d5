// SPDX-License-Identifier: Apache-2.0
#include "monitor/ObservableMap.h"

#include <utility>

namespace tonewerk {

ObservableMap::Observation::Observation(Observation&& other) noexcept
    : map_(std::move(other.map_)), identifier_(other.identifier_) {}

ObservableMap::Observation& ObservableMap::Observation::operator=(Observation&& other) noexcept {
  if (this == &other) return *this;
  end();
  map_ = std::move(other.map_);
  identifier_ = other.identifier_;
  return *this;
}

ObservableMap::Observation::~Observation() { end(); }

void ObservableMap::Observation::end() {
  const std::shared_ptr<ObservableMap> map = std::move(map_);
  if (map == nullptr) return;
  Registration removed;  // the observer and what it holds are destroyed after the lock is free
  const RecursiveMutexLock lock(map->mutex_);
  const auto found = map->observers_.find(identifier_);
  if (found == map->observers_.end()) return;
  removed = std::move(found->second);
  map->observers_.erase(found);
}

std::optional<ValueMap> ObservableMap::find(std::string_view key) const {
  const RecursiveMutexLock lock(mutex_);
  const auto found = values_.find(key);
  return found == values_.end() ? std::nullopt : std::optional(found->second);
}

void ObservableMap::set(std::string_view key, ValueMap value) {
  const RecursiveMutexLock lock(mutex_);
  values_.insert_or_assign(std::string(key), std::move(value));
  notify(key);
}

// Continues by identifier, not by iterator, because an observer may end any observation and add others.
void ObservableMap::notify(std::string_view key) {
  const std::uint64_t last = lastIdentifier_;
  for (auto next = observers_.begin(); next != observers_.end() && next->first <= last;) {
    const std::uint64_t identifier = next->first;
    if (next->second.key == key) {
      const SharedObserver observer = next->second.observer;
      (*observer)(key);
    }
    next = observers_.upper_bound(identifier);
  }
}

ObservableMap::Observation ObservableMap::observe(const std::shared_ptr<ObservableMap>& map, SharedString key,
                                                  SharedObserver observer) {
  const RecursiveMutexLock lock(map->mutex_);
  const std::uint64_t identifier = ++map->lastIdentifier_;
  // Identifiers ascend.
  map->observers_.emplace_hint(map->observers_.end(), identifier,
                               Registration{std::move(key), std::move(observer)});
  return {map, identifier};
}

ObservableMap::Observation ObservableMap::observe(const std::shared_ptr<ObservableMap>& map, SharedString key,
                                                  Observer observer) {
  return observe(map, std::move(key), std::make_shared<const Observer>(std::move(observer)));
}

std::size_t ObservableMap::observerCount() const {
  const RecursiveMutexLock lock(mutex_);
  return observers_.size();
}

}  // namespace tonewerk
