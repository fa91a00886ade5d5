// SPDX-License-Identifier: Apache-2.0
#include "tools/twctl/serve/StoredReport.h"

#include <algorithm>
#include <utility>

namespace tonewerk {

StoredReport::~StoredReport() {
  stop_.request_stop();
  {
    const MutexLock lock(mutex_);
    ends_ = true;
    changed_.notifyAll();
  }
  if (thread_.joinable()) thread_.join();
}

// The stamp is taken before the reading. A change during the reading is read again.
std::string StoredReport::readFirst() {
  stamp_ = source_.stamp();
  auto first = std::make_shared<Reading>(source_.read(stop_.get_token()));
  first->number = 1;
  const MutexLock lock(mutex_);
  newest_ = first;
  return first->problem;
}

void StoredReport::start() {
  thread_ = std::thread([this] { run(); });
}

void StoredReport::refresh() {
  const MutexLock lock(mutex_);
  isWanted_ = true;
  changed_.notifyAll();
}

std::shared_ptr<const StoredReport::Reading> StoredReport::newest() const {
  const MutexLock lock(mutex_);
  return newest_;
}

void StoredReport::run() {
  for (;;) {
    {
      MutexLock lock(mutex_);
      while (!ends_ && !isWanted_) changed_.wait(lock);
      if (ends_) return;
      isWanted_ = false;
    }
    const Clock::time_point begin = Clock::now();
    readIfChanged();
    const auto pause = std::max<Clock::duration>(kPause, kPauseFactor * (Clock::now() - begin));
    const Clock::time_point until = Clock::now() + pause;
    MutexLock lock(mutex_);
    while (!ends_ && Clock::now() < until) changed_.waitUntil(lock, until);
  }
}

void StoredReport::readIfChanged() {
  std::string stamp = source_.stamp();
  // After a problem the files may be back as they were.
  if (stamp == stamp_ && newest()->problem.empty()) return;
  auto next = std::make_shared<Reading>(source_.read(stop_.get_token()));
  // What failed is tried again.
  if (next->problem.empty()) stamp_ = std::move(stamp);
  const MutexLock lock(mutex_);
  next->number = newest_->number;
  if (next->problem.empty()) {
    ++next->number;
  } else {
    next->data = newest_->data;
    next->running = newest_->running;
  }
  newest_ = std::move(next);
}

}  // namespace tonewerk
