// SPDX-License-Identifier: Apache-2.0
#pragma once

#include <atomic>
#include <map>
#include <memory>
#include <mutex>
#include <typeindex>
#include <utility>
#include <vector>

#include "values/Mutex.h"

namespace tonewerk {

// Holds the process-wide objects of the rooms above session/: the workers', the monitor's and the driver
// statistics'. Each is found by its type and made once, on first use. All end with the registry, the one made
// last first.
//
// Any thread. The constructor of an object may get other objects, but not itself.
class SingletonRegistry {
 public:
  SingletonRegistry() = default;
  SingletonRegistry(const SingletonRegistry&) = delete;
  SingletonRegistry& operator=(const SingletonRegistry&) = delete;
  ~SingletonRegistry();

  // Returns the T. The first call makes it from `arguments`. It lives as long as the registry.
  template <class T, class... Arguments>
  T& get(Arguments&&... arguments) {
    Slot& slot = slotOf(typeid(T));
    std::call_once(slot.once,
                   [&] { keep(slot, std::make_shared<T>(std::forward<Arguments>(arguments)...)); });
    return *static_cast<T*>(slot.object.load());
  }

  // Returns null until get() has made the T.
  template <class T>
  T* find() {
    return static_cast<T*>(slotOf(typeid(T)).object.load());
  }

 private:
  struct Slot {
    std::once_flag once;
    std::atomic<void*> object = nullptr;
  };

  Slot& slotOf(std::type_index type);
  void keep(Slot& slot, std::shared_ptr<void> object);

  Mutex mutex_;
  std::map<std::type_index, Slot> slots_ GUARDED_BY(mutex_);  // a slot never moves
  // In the order in which they were made.
  std::vector<std::shared_ptr<void>> objects_ GUARDED_BY(mutex_);
};

}  // namespace tonewerk
