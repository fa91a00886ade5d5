// SPDX-License-Identifier: Apache-2.0
#pragma once

#include <chrono>
#include <condition_variable>
#include <mutex>

#include "values/ThreadAnnotations.h"

namespace tonewerk {

// Wrap the standard library's mutexes and condition variable in types that clang's analysis knows. It rejects
// code that reads or writes a GUARDED_BY member without the lock. They cost as much as the standard's.
//
//   Mutex mutex_;
//   Condition changed_;
//   std::vector<Task> tasks_ GUARDED_BY(mutex_);
//
//   MutexLock lock(mutex_);
//   while (tasks_.empty()) changed_.wait(lock);
//
// There is no wait with a predicate, because the analysis does not know inside a lambda that the lock is
// held.
class CAPABILITY("mutex") Mutex {
 public:
  Mutex() = default;
  Mutex(const Mutex&) = delete;
  Mutex& operator=(const Mutex&) = delete;

  void lock() ACQUIRE() { mutex_.lock(); }
  void unlock() RELEASE() { mutex_.unlock(); }
  [[nodiscard]] bool try_lock() TRY_ACQUIRE(true) { return mutex_.try_lock(); }

 private:
  friend class MutexLock;
  std::mutex mutex_;
};

// Holds a mutex until its scope ends; may release it and lock it again in between.
class SCOPED_CAPABILITY MutexLock {
 public:
  explicit MutexLock(Mutex& mutex) ACQUIRE(mutex) : lock_(mutex.mutex_) {}
  ~MutexLock() RELEASE() {}
  MutexLock(const MutexLock&) = delete;
  MutexLock& operator=(const MutexLock&) = delete;

  void unlock() RELEASE() { lock_.unlock(); }
  void lock() ACQUIRE() { lock_.lock(); }

 private:
  friend class Condition;
  std::unique_lock<std::mutex> lock_;
};

// Lets threads wait for a change; the mutex is unlocked while they wait. A wait may end without a
// notification, so callers wait in a loop.
class Condition {
 public:
  void notifyOne() { condition_.notify_one(); }
  void notifyAll() { condition_.notify_all(); }

  void wait(MutexLock& lock) { condition_.wait(lock.lock_); }

  // Returns false when the time was reached before a notification.
  template <typename Clock, typename Duration>
  bool waitUntil(MutexLock& lock, const std::chrono::time_point<Clock, Duration>& time) {
    return condition_.wait_until(lock.lock_, time) == std::cv_status::no_timeout;
  }

 private:
  std::condition_variable condition_;
};

// A mutex that the thread that holds it may lock again.
class CAPABILITY("mutex") RecursiveMutex {
 public:
  RecursiveMutex() = default;
  RecursiveMutex(const RecursiveMutex&) = delete;
  RecursiveMutex& operator=(const RecursiveMutex&) = delete;

  void lock() ACQUIRE() { mutex_.lock(); }
  void unlock() RELEASE() { mutex_.unlock(); }

 private:
  std::recursive_mutex mutex_;
};

class SCOPED_CAPABILITY RecursiveMutexLock {
 public:
  explicit RecursiveMutexLock(RecursiveMutex& mutex) ACQUIRE(mutex) : mutex_(mutex) { mutex_.lock(); }
  ~RecursiveMutexLock() RELEASE() { mutex_.unlock(); }
  RecursiveMutexLock(const RecursiveMutexLock&) = delete;
  RecursiveMutexLock& operator=(const RecursiveMutexLock&) = delete;

 private:
  RecursiveMutex& mutex_;
};

}  // namespace tonewerk
