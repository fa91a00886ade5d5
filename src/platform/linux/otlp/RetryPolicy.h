// SPDX-License-Identifier: Apache-2.0
#pragma once

#include <chrono>
#include <functional>
#include <optional>
#include <string_view>
#include <utility>

#include "values/GrowingDelay.h"

namespace tonewerk {

// When an exporter tries again.
class RetryPolicy {
 public:
  using Duration = GrowingDelay::Duration;

  static constexpr std::chrono::seconds kFirst{5};
  static constexpr double kFactor = 1.5;
  static constexpr std::chrono::seconds kLongest{30};
  // What an endpoint can ask for: from this, so that it cannot have itself hammered, to that, so that it
  // cannot silence a device for ever.
  static constexpr std::chrono::seconds kShortestAsked{1};
  static constexpr std::chrono::seconds kLongestAsked{3600};

  enum class Verdict {
    kDelivered,
    kRetry,  // 429, 502, 503, 504, or no answer
    kSplit,  // 413: send halves
    kDrop,   // any other refusal, redirections included
  };
  // `status` as HTTP has it, 0 without an answer.
  [[nodiscard]] static Verdict verdictOf(int status);

  // `jitter` gives numbers from 0 to below 1.
  explicit RetryPolicy(std::function<double()> jitter) : jitter_(std::move(jitter)) {}

  // How long to wait after a failure: what the endpoint asked for, or half to the whole of an interval that
  // grows by half with every failure in a row.
  Duration delayAfterFailure(std::optional<std::chrono::seconds> asked);
  void succeeded() { interval_.reset(); }

 private:
  std::function<double()> jitter_;
  GrowingDelay interval_{kFirst, kLongest, kFactor};
};

// The time that a Retry-After header asks for, as seconds from now or as a date of HTTP; `now` in seconds
// since 1970. A date that has passed is zero; none for anything else.
[[nodiscard]] std::optional<std::chrono::seconds> parseRetryAfter(std::string_view text, double now);

}  // namespace tonewerk
