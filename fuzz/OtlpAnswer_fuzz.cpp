// SPDX-License-Identifier: Apache-2.0
//
// Reads the input as what an endpoint answers: a Retry-After header, in a text whose length is the first
// byte, and a body.
#include <algorithm>
#include <chrono>
#include <cstddef>
#include <cstdint>
#include <optional>
#include <string>
#include <string_view>

#include "FuzzInput.h"
#include "platform/linux/otlp/OtlpAnswer.h"
#include "platform/linux/otlp/RetryPolicy.h"
#include "values/Utf8.h"

namespace tonewerk {
namespace {

constexpr double kNow = 1'763'633'880.0;

void readDelay(std::string_view text) {
  const std::optional<std::chrono::seconds> asked = parseRetryAfter(text, kNow);
  expect(!asked || asked->count() >= 0);
  RetryPolicy policy([] { return 0.5; });
  for (int failure = 0; failure < 3; ++failure) {
    const RetryPolicy::Duration delay = policy.delayAfterFailure(asked);
    expect(delay >= RetryPolicy::kShortestAsked && delay <= RetryPolicy::kLongestAsked);
  }
}

void readBody(std::string_view body) {
  const std::optional<OtlpAnswer> answer = parseOtlpAnswer(body);
  const std::string shown = quotable(answer ? answer->message : body);
  expect(std::all_of(shown.begin(), shown.end(), [](char c) { return c >= ' ' && c <= '~'; }));
  expect(!answer || isUtf8(answer->message));
}

}  // namespace
}  // namespace tonewerk

extern "C" int LLVMFuzzerTestOneInput(const std::uint8_t* data, std::size_t size) {
  tonewerk::FuzzInput input(data, size);
  tonewerk::readDelay(input.shortText());
  tonewerk::readBody(input.rest());
  return 0;
}
