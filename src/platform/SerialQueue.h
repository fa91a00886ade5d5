// SPDX-License-Identifier: Apache-2.0
#pragma once

#include <memory>
#include <string>

#include "values/UniqueFunction.h"

namespace tonewerk {

// Runs pieces of work one after the other, in the order in which they were queued, on one thread at a time.
//
// Any thread may call async() and isCurrent(); a piece of work may call async(), too. Destroying the queue
// runs what is still queued and then returns; work queued during that is run as well. A queue must not be
// destroyed from its own work.
class SerialQueue {
 public:
  virtual ~SerialQueue() = default;

  // Never blocks. The work is destroyed on the queue, right after it has run.
  virtual void async(Task work) = 0;

  // Runs `work` at once, on the calling thread and as the queue's own work, when nothing else runs or is
  // queued. Returns false, without running it, otherwise; a queue may always do that. What is queued
  // meanwhile waits, so `work` must be short. Any thread; not in the queue's own work.
  template <typename Work>
  [[nodiscard]] bool runAtOnce(Work&& work) {
    if (!tryLend()) return false;
    const Loan loan(*this);
    work();
    return true;
  }

  // Returns when everything queued before the call has run. Do not call it from the queue's own work.
  virtual void drain() = 0;

  // Returns true on the thread that is running this queue's work.
  virtual bool isCurrent() const = 0;

  // Returns true where objects that live on this queue may be used: in the queue's own work. A queue without
  // a thread of its own, as in tests, also returns true on the thread that made it. For assertions.
  virtual bool ownsThisThread() const { return isCurrent(); }

  virtual const std::string& name() const = 0;

 private:
  class Loan {
   public:
    explicit Loan(SerialQueue& queue) : queue_(queue) {}
    Loan(const Loan&) = delete;
    Loan& operator=(const Loan&) = delete;
    ~Loan() { queue_.takeBack(); }

   private:
    SerialQueue& queue_;
  };

  // Makes the calling thread the one that runs this queue's work, until takeBack(), when there is none.
  [[nodiscard]] virtual bool tryLend() { return false; }
  virtual void takeBack() {}
};

enum class QueuePriority {
  kUtility,          // after everything for which a user waits
  kUserInteractive,  // the highest class of ordinary threads
};

class SerialQueueFactory {
 public:
  virtual ~SerialQueueFactory() = default;

  // `name` is for people: logs, debuggers and (shortened to 15 bytes) the thread's name.
  [[nodiscard]] virtual std::unique_ptr<SerialQueue> makeSerialQueue(std::string name,
                                                                     QueuePriority priority) = 0;
};

}  // namespace tonewerk
