// SPDX-License-Identifier: Apache-2.0
#include "tools/twctl/serve/LiveFeed.h"

#include <utility>

namespace tonewerk {

void LiveFeed::publish(std::string state) {
  auto next = std::make_shared<const std::string>(std::move(state));
  const MutexLock lock(mutex_);
  state_ = std::move(next);
  ++number_;
  changed_.notifyAll();
}

std::shared_ptr<const std::string> LiveFeed::newerThan(std::uint64_t& number,
                                                       std::chrono::milliseconds patience) {
  const auto until = std::chrono::steady_clock::now() + patience;
  MutexLock lock(mutex_);
  while (!hasEnded_ && number_ <= number) {
    if (!changed_.waitUntil(lock, until) && number_ <= number) return nullptr;
  }
  if (hasEnded_) return nullptr;
  number = number_;
  return state_;
}

void LiveFeed::end() {
  const MutexLock lock(mutex_);
  hasEnded_ = true;
  changed_.notifyAll();
}

bool LiveFeed::hasEnded() const {
  const MutexLock lock(mutex_);
  return hasEnded_;
}

LiveFeed::Reader::Reader(LiveFeed& feed) : feed_(feed) {
  const MutexLock lock(feed_.mutex_);
  ++feed_.readers_;
}

LiveFeed::Reader::~Reader() {
  const MutexLock lock(feed_.mutex_);
  --feed_.readers_;
}

std::size_t LiveFeed::readers() const {
  const MutexLock lock(mutex_);
  return readers_;
}

}  // namespace tonewerk
