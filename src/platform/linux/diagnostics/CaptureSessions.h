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

// One capture that the service was asked for.
struct CaptureRequest {
  FaultsignSignature signature;
  double duration = 0.0;  // seconds
  std::optional<ValueMap> payload;
};

// The capture service's sessions, from the request to the moment at which the capture is made:
//
//   snapshot() -> judged -> made
//   start()    -> judged -> pending -> made when the duration has passed
//                                   -> cancelled
//                                   -> dropped at the end
//
// Any thread. Whoever has a reference may use it, also after finish().
class CaptureSessions : public std::enable_shared_from_this<CaptureSessions> {
 public:
  // As many as two days' captures, which is what the longest duration can bring together: the day's number is
  // what a symptom meets, not this.
  static constexpr std::size_t kMaxPending = 2 * CapturePolicy::kMaxADay;

  // Makes the capture; false when there is no room for it. On any thread; never waits and never comes back
  // here.
  using Capture = std::function<bool(const std::string& identifier, const CaptureRequest& request)>;

  struct Outcome {
    FaultsignError error = kFaultsignErrorNone;
    std::string identifier = {};  // an ULID; empty with an error
  };

  // The clock and the timers outlive it; `capture` is not called after finish().
  CaptureSessions(const Clock& clock, TimerService& timers, CapturePolicy::Count count, Capture capture);
  CaptureSessions(const CaptureSessions&) = delete;
  CaptureSessions& operator=(const CaptureSessions&) = delete;
  ~CaptureSessions();

  // Besides what the policy refuses: kFaultsignErrorServiceUnavailable without room for the capture or for
  // one more that is pending, and after finish(). Those do not count.
  [[nodiscard]] Outcome snapshot(const CaptureRequest& request);
  [[nodiscard]] Outcome start(const CaptureRequest& request);

  // False when no such session is pending: it never was, or its capture was made or cancelled already.
  [[nodiscard]] bool cancel(const std::string& identifier);

  // Drops what is pending and takes no more. The identifiers that were dropped, in the order of their start;
  // of a capture that is becoming due at the same time either it was made when this returns, or never will
  // be.
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
