// SPDX-License-Identifier: Apache-2.0
#pragma once

#include <cstdint>
#include <functional>
#include <map>
#include <memory>
#include <optional>
#include <string>
#include <string_view>

#include "values/Mutex.h"
#include "values/Value.h"

namespace tonewerk {

// A map whose observers are woken when a key of theirs is set, before set() returns.
//
//   const auto map = std::make_shared<ObservableMap>();
//   auto observation = map->observe("ringerstate", [&](std::string_view key) { ... map->find(key) ... });
//   map->set("ringerstate", state);   // wakes it
//   observation = {};                 // from here on it is not woken
//
// Any thread. The lock is held while observers run, so that a set and its observers are one step to everybody
// else, and whoever holds it may read, judge and set in one step too. It is recursive, because an observer
// does whatever a message into a session leads to: it may look into the map, set it, and add and end
// observations, its own included.
//
// Why no order of this deadlocks: a thread that holds the map's lock may take any other lock of the daemon,
// so nobody may wait for the map while holding a lock that observers take. The daemon sets and observes on
// the work queue alone, which holds none of its own while it runs a piece of work; other threads only ever
// push work onto it.
class ObservableMap {
 public:
  using Observer = std::function<void(std::string_view key)>;

  // One observer of one key, until it is destroyed. Keeps the map alive.
  class Observation {
   public:
    Observation() = default;
    Observation(Observation&& other) noexcept;
    Observation& operator=(Observation&& other) noexcept;
    // The observer is not woken any more, and is not running on another thread, when it returns.
    ~Observation();

   private:
    friend class ObservableMap;
    Observation(std::shared_ptr<ObservableMap> map, std::uint64_t identifier)
        : map_(std::move(map)), identifier_(identifier) {}
    void end();

    std::shared_ptr<ObservableMap> map_;
    std::uint64_t identifier_ = 0;
  };

  ObservableMap() = default;
  ObservableMap(const ObservableMap&) = delete;
  ObservableMap& operator=(const ObservableMap&) = delete;

  // None when the key was never set.
  std::optional<ValueMap> find(std::string_view key) const;

  // Stores the value and wakes the key's observers, in the order in which they came, whether or not it is
  // another value than before. One that comes while they are woken is not woken this time.
  void set(std::string_view key, ValueMap value);

  // `map` as the argument, since the observation shares it.
  [[nodiscard]] static Observation observe(const std::shared_ptr<ObservableMap>& map, std::string_view key,
                                           Observer observer);
  std::size_t observerCount() const;

  // What is done while it is held is one step to others.
  RecursiveMutex& mutex() const RETURN_CAPABILITY(mutex_) { return mutex_; }

 private:
  struct Observing {
    std::string key;
    std::shared_ptr<const Observer> observer;  // shared with a call that is under way
  };

  void wake(std::string_view key) REQUIRES(mutex_);

  mutable RecursiveMutex mutex_;
  std::map<std::string, ValueMap, std::less<>> values_ GUARDED_BY(mutex_);
  std::map<std::uint64_t, Observing> observers_ GUARDED_BY(mutex_);  // by identifier, which ascends
  std::uint64_t lastIdentifier_ GUARDED_BY(mutex_) = 0;
};

}  // namespace tonewerk
