// SPDX-License-Identifier: Apache-2.0
#pragma once

#include <atomic>
#include <chrono>
#include <cstdint>
#include <memory>

namespace tonewerk {

// Shows whether a thread that has work makes progress. One thread writes it, any thread reads it:
//
//   beat()            rest()                    beat()
//     works, and gets on  |  has nothing to do    |  works again
//
// A reader compares two readings: a thread that works and has not beaten in between has not moved. No clock
// is read, so a beat costs about a nanosecond.
class Heartbeat {
 public:
  struct Reading {
    std::uint64_t beats = 0;
    bool isWorking = false;
    // How much longer than usual the thread may take for what it does now.
    std::chrono::milliseconds allowance{0};
  };

  class OnThisThread;
  class Rest;
  class LongWork;

  Heartbeat() = default;
  Heartbeat(const Heartbeat&) = delete;
  Heartbeat& operator=(const Heartbeat&) = delete;

  // Written by the thread itself. Another thread may write while the thread waits for it, if a lock keeps the
  // thread waiting meanwhile.
  void beat() { write(kWorking); }
  void rest() { write(0); }

  // Any thread.
  Reading read() const;

  // Beats for the calling thread, if it has a heartbeat: for loops that are deep inside its work.
  static void beatHere();
  // The calling thread's; null if it has none.
  static std::shared_ptr<const Heartbeat> ofThisThread();

 private:
  static constexpr std::uint64_t kWorking = 1;
  static constexpr std::uint64_t kOneBeat = 2;

  void write(std::uint64_t working) {
    const std::uint64_t state = state_.load(std::memory_order_relaxed);
    state_.store(((state & ~kWorking) + kOneBeat) | working, std::memory_order_release);
  }

  std::atomic<std::uint64_t> state_ = 0;  // the beats, above the bit kWorking
  std::atomic<std::int64_t> allowanceMilliseconds_ = 0;
};

// Makes a heartbeat the calling thread's, as long as this lives. A thread has one at a time.
class Heartbeat::OnThisThread {
 public:
  explicit OnThisThread(std::shared_ptr<Heartbeat> heartbeat);
  OnThisThread(const OnThisThread&) = delete;
  OnThisThread& operator=(const OnThisThread&) = delete;
  // The thread counts as resting from then on.
  ~OnThisThread();

 private:
  friend class Heartbeat;

  const std::shared_ptr<Heartbeat> heartbeat_;
};

// The calling thread has nothing to do, or waits for something else than its work, as long as this lives.
// Does nothing on a thread without a heartbeat.
class Heartbeat::Rest {
 public:
  Rest();
  Rest(const Rest&) = delete;
  Rest& operator=(const Rest&) = delete;
  ~Rest() { beatHere(); }
};

// Work of the calling thread that may take this much longer than usual, by design. Scopes nest; the largest
// bound counts. Does nothing on a thread without a heartbeat.
class Heartbeat::LongWork {
 public:
  explicit LongWork(std::chrono::nanoseconds bound);
  LongWork(const LongWork&) = delete;
  LongWork& operator=(const LongWork&) = delete;
  ~LongWork();

 private:
  std::int64_t outerMilliseconds_ = 0;
};

}  // namespace tonewerk
