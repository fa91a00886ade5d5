// SPDX-License-Identifier: Apache-2.0
#include "tools/offline/OfflineQueues.h"

#include <algorithm>
#include <deque>
#include <utility>

namespace tonewerk {

class OfflineQueue final : public SerialQueue {
 public:
  OfflineQueue(OfflineQueues& queues, std::string name, bool runsAtOnce)
      : queues_(queues), name_(std::move(name)), runsAtOnce_(runsAtOnce) {
    queues_.queues_.push_back(this);
  }
  OfflineQueue(const OfflineQueue&) = delete;
  OfflineQueue& operator=(const OfflineQueue&) = delete;
  ~OfflineQueue() override {
    runWork();
    std::erase(queues_.queues_, this);
  }

  void async(Task work) override {
    pending_.push_back(std::move(work));
    if (runsAtOnce_) runWork();
  }
  void drain() override { runWork(); }
  bool isCurrent() const override { return isRunning_; }
  // Everything is on one thread.
  bool ownsThisThread() const override { return true; }
  const std::string& name() const override { return name_; }

  bool hasWork() const { return !pending_.empty() && !isRunning_; }

  void runWork() {
    if (isRunning_) return;
    isRunning_ = true;
    while (!pending_.empty()) {
      const Task work = std::move(pending_.front());
      pending_.pop_front();
      work();
    }
    isRunning_ = false;
  }

 private:
  OfflineQueues& queues_;
  const std::string name_;
  const bool runsAtOnce_;
  std::deque<Task> pending_;
  bool isRunning_ = false;
};

std::unique_ptr<SerialQueue> OfflineQueues::makeSerialQueue(std::string name, QueuePriority priority) {
  return std::make_unique<OfflineQueue>(*this, std::move(name), priority != QueuePriority::kUserInteractive);
}

void OfflineQueues::runAll() {
  for (;;) {
    const auto next = std::find_if(queues_.begin(), queues_.end(),
                                   [](const OfflineQueue* queue) { return queue->hasWork(); });
    if (next == queues_.end()) return;
    (*next)->runWork();
  }
}

}  // namespace tonewerk
