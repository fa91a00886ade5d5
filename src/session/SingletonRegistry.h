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

// The objects of which a process has one but which session/ does not know: those of the workers, the monitor
// and the driver statistics. Found by their type, each made once, on first use, and ended with all others,
// last made first.
//
// Any thread. Making one may use others, not itself.
class SingletonRegistry {
 public:
  SingletonRegistry() = default;
  SingletonRegistry(const SingletonRegistry&) = delete;
  SingletonRegistry& operator=(const SingletonRegistry&) = delete;
  ~SingletonRegistry();

  // The one T; the first call makes it of `arguments`. Lives as long as this does.
  template <class T, class... Arguments>
  T& get(Arguments&&... arguments) {
    Slot& slot = slotOf(typeid(T));
    std::call_once(slot.once,
                   [&] { keep(slot, std::make_shared<T>(std::forward<Arguments>(arguments)...)); });
    return *static_cast<T*>(slot.object.load());
  }

  // Null as long as nobody has asked for it to be made.
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
  std::map<std::type_index, Slot> slots_ GUARDED_BY(mutex_);  // a slot keeps its place
  // In the order in which they were made.
  std::vector<std::shared_ptr<void>> objects_ GUARDED_BY(mutex_);
};

}  // namespace tonewerk
