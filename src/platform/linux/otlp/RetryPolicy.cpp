// SPDX-License-Identifier: Apache-2.0
#include "platform/linux/otlp/RetryPolicy.h"

#include <algorithm>
#include <charconv>
#include <cmath>
#include <cstdint>
#include <ctime>
#include <string>

namespace tonewerk {
namespace {

constexpr std::int64_t kMaxSeconds = 1'000'000'000;

std::optional<std::int64_t> secondsIn(std::string_view text) {
  if (text.empty() || !std::all_of(text.begin(), text.end(), [](char c) { return c >= '0' && c <= '9'; })) {
    return std::nullopt;
  }
  std::int64_t seconds = 0;
  const auto [end, error] = std::from_chars(text.data(), text.data() + text.size(), seconds);
  // A number that does not fit into 64 bits counts as the longest time.
  return error == std::errc() ? std::min(seconds, kMaxSeconds) : kMaxSeconds;
}

std::optional<double> timeIn(const std::string& text) {
  // HTTP's date format, and the two obsolete ones that must still be accepted.
  for (const char* format :
       {"%a, %d %b %Y %H:%M:%S GMT", "%A, %d-%b-%y %H:%M:%S GMT", "%a %b %d %H:%M:%S %Y"}) {
    std::tm parts{};
    const char* end = strptime(text.c_str(), format, &parts);
    if (end != nullptr && *end == '\0') return static_cast<double>(timegm(&parts));
  }
  return std::nullopt;
}

std::string_view trimmed(std::string_view text) {
  const std::size_t first = text.find_first_not_of(" \t\r\n");
  if (first == std::string_view::npos) return {};
  return text.substr(first, text.find_last_not_of(" \t\r\n") - first + 1);
}

}  // namespace

RetryPolicy::Verdict RetryPolicy::verdictOf(int status) {
  if (status >= 200 && status < 300) return Verdict::kDelivered;
  switch (status) {
    case 413:
      return Verdict::kSplit;
    case 0:
    case 429:
    case 502:
    case 503:
    case 504:
      return Verdict::kRetry;
    default:
      return Verdict::kDrop;
  }
}

RetryPolicy::Duration RetryPolicy::delayAfterFailure(std::optional<std::chrono::seconds> asked) {
  const Duration interval = interval_.next();
  if (asked) return std::clamp(*asked, kShortestAsked, kLongestAsked);
  return std::chrono::duration_cast<Duration>(interval * (0.5 + 0.5 * jitter_()));
}

std::optional<std::chrono::seconds> parseRetryAfter(std::string_view text, double now) {
  const std::string_view value = trimmed(text);
  if (const auto seconds = secondsIn(value)) return std::chrono::seconds(*seconds);
  const std::optional<double> time = timeIn(std::string(value));
  if (!time) return std::nullopt;
  const double ahead = std::clamp(std::ceil(*time - now), 0.0, static_cast<double>(kMaxSeconds));
  return std::chrono::seconds(static_cast<std::int64_t>(ahead));
}

}  // namespace tonewerk
