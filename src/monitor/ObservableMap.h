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
#include "values/SharedString.h"
#include "values/Value.h"

namespace tonewerk {

// Maps keys to values and notifies a key's observers when the key is set, before set() returns.
//
//   const auto map = std::make_shared<ObservableMap>();
//   auto observation = ObservableMap::observe(map, "ringerstate",
//                                             [&](std::string_view key) { ... map->find(key) ... });
//   map->set("ringerstate", state);   // notifies it
//   observation = {};                 // from here on it is not notified
//
// Any thread may use it. The map's lock is held while observers run, so other threads see a set and its
// notifications as one step. A caller that holds the lock can also read, decide and set in one step. The lock
// is recursive, because an observer may send a message into a session, and that may lead to any call here: an
// observer may read and set the map, and add and end observations, its own included.
//
// Why this cannot deadlock: a thread that holds the map's lock may take any other lock of the daemon, so no
// thread may wait for the map while it holds a lock that observers take. The daemon sets and observes only on
// the work queue, and the work queue holds no lock of its own while it runs a piece of work. Other threads
// only push work onto that queue.
class ObservableMap {
 public:
  using Observer = std::function<void(std::string_view key)>;
  // May observe several keys.
  using SharedObserver = std::shared_ptr<const Observer>;

  // Keeps one observer of one key registered until it is destroyed. Keeps the map alive.
  class Observation {
   public:
    Observation() = default;
    Observation(Observation&& other) noexcept;
    Observation& operator=(Observation&& other) noexcept;
    // When it returns, the observer is not running on another thread and is not notified again.
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

  // Returns nullopt when the key was never set.
  std::optional<ValueMap> find(std::string_view key) const;

  // Stores the value and notifies the key's observers in the order in which they were added, also when the
  // value is the same as before. An observer that is added meanwhile is not notified of this set.
  void set(std::string_view key, ValueMap value);

  // Takes `map` as an argument, because the observation shares its ownership.
  [[nodiscard]] static Observation observe(const std::shared_ptr<ObservableMap>& map, SharedString key,
                                           SharedObserver observer);
  [[nodiscard]] static Observation observe(const std::shared_ptr<ObservableMap>& map, SharedString key,
                                           Observer observer);
  std::size_t observerCount() const;

  // The map's lock. Other threads see everything that is done while it is held as one step.
  RecursiveMutex& mutex() const RETURN_CAPABILITY(mutex_) { return mutex_; }

 private:
  struct Registration {
    SharedString key;
    SharedObserver observer;  // shared with a running call of it
  };

  void notify(std::string_view key) REQUIRES(mutex_);

  mutable RecursiveMutex mutex_;
  std::map<std::string, ValueMap, std::less<>> values_ GUARDED_BY(mutex_);
  std::map<std::uint64_t, Registration> observers_ GUARDED_BY(mutex_);  // by identifier; identifiers ascend
  std::uint64_t lastIdentifier_ GUARDED_BY(mutex_) = 0;
};

}  // namespace tonewerk
