// SPDX-License-Identifier: Apache-2.0
#include "values/Mutex.h"

namespace tonewerk {

// Forgets the lock, so clang must refuse it.
class Counter {
 public:
  void increase() { ++count_; }

 private:
  Mutex mutex_;
  int count_ GUARDED_BY(mutex_) = 0;
};

void use(Counter& counter) { counter.increase(); }

}  // namespace tonewerk
