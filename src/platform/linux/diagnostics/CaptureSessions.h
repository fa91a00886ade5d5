// SPDX-License-Identifier: Apache-2.0
#pragma once

#include <cstddef>
#include <functional>
#include <map>
#include <memory>
#include <optional>
#include <string>
#include <string_view>
#include <vector>

#include "platform/FaultsignReporter.h"
#include "platform/linux/diagnostics/CapturePolicy.h"
#include "platform/linux/files/Ulid.h"
#include "values/Mutex.h"

namespace tonewerk {

class Clock;
class Timer;
class TimerService;

// A request for one capture.
struct CaptureRequest {
  FaultsignSignature signature;
  double duration = 0.0;  // seconds
  std::optional<ValueMap> payload;
};

// Manages the capture service's sessions from the request until the capture is made:
//
//   snapshot() -> judged -> made
//   start()    -> judged -> pending -> made after the duration
//                                   -> cancelled
//                                   -> dropped by finish()
//
// Any thread. It may also be used after finish().
class CaptureSessions : public std::enable_shared_from_this<CaptureSessions> {
 public:
  // With the longest duration, the captures of two days can be pending at once. So this limit is never
  // reached before the daily limit.
  static constexpr std::size_t kMaxPending = 2 * CapturePolicy::kMaxPerDay;

  // Makes the capture; false if there is no room for it. It is called on any thread. It must not wait and
  // must not call this object.
  using Capture = std::function<bool(const std::string& identifier, const CaptureRequest& request)>;

  struct Outcome {
    FaultsignError error = kFaultsignErrorNone;
    std::string identifier = {};  // an ULID; empty with an error
  };

  // The clock and the timers must outlive this object. `capture` is not called after finish().
  CaptureSessions(const Clock& clock, TimerService& timers, CapturePolicy::Count count, Capture capture);
  CaptureSessions(const CaptureSessions&) = delete;
  CaptureSessions& operator=(const CaptureSessions&) = delete;
  ~CaptureSessions();

  // Make a capture now, or after its duration. Besides the policy's errors, they fail with
  // kFaultsignErrorServiceUnavailable if there is no room for the capture, if too many are pending, and after
  // finish(). Such captures are not counted.
  [[nodiscard]] Outcome snapshot(const CaptureRequest& request);
  [[nodiscard]] Outcome start(const CaptureRequest& request);

  // False if no such session is pending: it never existed, or its capture was already made or cancelled.
  [[nodiscard]] bool cancel(const std::string& identifier);

  // Drops all pending sessions and accepts no more. Returns the dropped identifiers in the order of their
  // start. A capture that becomes due at the same time either was made when this function returns, or is
  // never made.
  std::vector<std::string> finish();

  CapturePolicy::Count count() const;

 private:
  struct Pending {
    CaptureRequest request;
    CapturePolicy::Acceptance acceptance;
    std::unique_ptr<Timer> timer;
  };

  void fire(const std::string& identifier);

  const Clock& clock_;
  TimerService& timers_;
  mutable Mutex mutex_;
  bool isFinished_ GUARDED_BY(mutex_) = false;
  CapturePolicy policy_ GUARDED_BY(mutex_);
  Capture capture_ GUARDED_BY(mutex_);
  UlidGenerator identifiers_ GUARDED_BY(mutex_);
  // Identifiers sort by time.
  std::map<std::string, Pending, std::less<>> pending_ GUARDED_BY(mutex_);
};

}  // namespace tonewerk
