// SPDX-License-Identifier: Apache-2.0
#pragma once

#include <atomic>
#include <chrono>
#include <cstdint>
#include <optional>

namespace tonewerk {

// Knows whether a session plays and records, and since when it has done the first of the two without a pause.
//
// Any thread may call it. It takes no lock, allocates nothing and makes no system call. A call repeats its
// few instructions only when another thread has begun or ended something in between. `now` is the time of a
// monotonic clock, the same one for all calls.
class AudioActivity {
 public:
  using Time = std::chrono::microseconds;

  enum Kind : std::uint64_t { kPlaying = 1, kRecording = 2 };

  struct End {
    bool wasRunning = false;
    // Since the beginning of the activity; none while something else still runs.
    std::optional<double> seconds;
    // For resume().
    std::uint64_t since = 0;
  };

  // Returns false when it was running already.
  bool begin(Kind kind, Time now);
  End end(Kind kind, Time now);
  // Takes back an end that could not be reported.
  void resume(Kind kind, const End& end);

 private:
  static constexpr std::uint64_t kKinds = kPlaying | kRecording;

  // The beginning, in microseconds of a monotonic clock, as a multiple of 4; and the kinds that run.
  std::atomic<std::uint64_t> state_{0};
};

}  // namespace tonewerk
