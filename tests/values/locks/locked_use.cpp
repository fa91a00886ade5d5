// SPDX-License-Identifier: Apache-2.0
#include "values/Mutex.h"

namespace tonewerk {

class Counter {
 public:
  void increase() {
    const MutexLock lock(mutex_);
    ++count_;
  }

 private:
  Mutex mutex_;
  int count_ GUARDED_BY(mutex_) = 0;
};

void use(Counter& counter) { counter.increase(); }

}  // namespace tonewerk
