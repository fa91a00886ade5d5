// SPDX-License-Identifier: Apache-2.0
#include "platform/linux/threads/ThreadProperties.h"

#include <pthread.h>
#include <string>
#include <sys/resource.h>
#include <unistd.h>

namespace tonewerk {

void nameThisThread(std::string_view name) {
  constexpr std::size_t kMax = 15;
  if (name.size() > kMax) name.remove_prefix(name.size() - kMax);
  pthread_setname_np(pthread_self(), std::string(name).c_str());
}

void setNicenessOfThisThread(int niceness) {
  // On Linux each thread has its own niceness. Without the permission it stays unchanged.
  setpriority(PRIO_PROCESS, static_cast<id_t>(gettid()), niceness);
}

}  // namespace tonewerk
