// SPDX-License-Identifier: Apache-2.0
#include "client/Backoff.h"

#include <algorithm>

namespace tonewerk {

std::chrono::milliseconds Backoff::next() {
  const auto about = std::chrono::duration_cast<std::chrono::milliseconds>(delay_.next());
  std::uniform_int_distribution<std::chrono::milliseconds::rep> within(-about.count() / 4, about.count() / 4);
  return std::clamp(about + std::chrono::milliseconds(within(random_)), first_, max_);
}

}  // namespace tonewerk
