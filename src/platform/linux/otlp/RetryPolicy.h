// SPDX-License-Identifier: Apache-2.0
#pragma once

#include <chrono>
#include <functional>
#include <optional>
#include <string_view>
#include <utility>

#include "values/GrowingDelay.h"

namespace tonewerk {

// Decides whether and when an exporter sends a request again.
class RetryPolicy {
 public:
  using Duration = GrowingDelay::Duration;

  static constexpr std::chrono::seconds kFirst{5};
  static constexpr double kFactor = 1.5;
  static constexpr std::chrono::seconds kLongest{30};
  // Bounds of a delay that an endpoint asks for: so it can neither make a device send requests too often nor
  // stop it for ever.
  static constexpr std::chrono::seconds kShortestAsked{1};
  static constexpr std::chrono::seconds kLongestAsked{3600};

  enum class Verdict {
    kDelivered,
    kRetry,  // 429, 502, 503, 504, or no answer
    kSplit,  // 413: send halves
    kDrop,   // any other refusal, redirections included
  };
  // `status` is the HTTP status; 0 without an answer.
  [[nodiscard]] static Verdict verdictOf(int status);

  // `jitter` returns random numbers from 0 to below 1.
  explicit RetryPolicy(std::function<double()> jitter) : jitter_(std::move(jitter)) {}

  // How long to wait after a failure. That is the time that the endpoint `asked` for, within the bounds
  // above; otherwise a random time between half and all of an interval, which grows by half with each failure
  // in a row.
  Duration delayAfterFailure(std::optional<std::chrono::seconds> asked);
  void succeeded() { interval_.reset(); }

 private:
  std::function<double()> jitter_;
  GrowingDelay interval_{kFirst, kLongest, kFactor};
};

// Parses a Retry-After header: a number of seconds, or an HTTP date, of which the result is the time from
// `now` (seconds since 1970). A date in the past gives zero; anything else gives none.
[[nodiscard]] std::optional<std::chrono::seconds> parseRetryAfter(std::string_view text, double now);

}  // namespace tonewerk
