// SPDX-License-Identifier: Apache-2.0
#include "platform/linux/channels/PcmStatus.h"

#include <algorithm>
#include <charconv>
#include <limits>

namespace tonewerk {
namespace {

constexpr std::string_view kClosed = "closed";

std::string_view trimmed(std::string_view text) {
  const std::size_t begin = std::min(text.find_first_not_of(" \t\n"), text.size());
  const std::size_t end = text.find_last_not_of(" \t\n");
  return end == std::string_view::npos ? std::string_view() : text.substr(begin, end + 1 - begin);
}

// The value of the line "name : value".
std::optional<std::string_view> valueOf(std::string_view text, std::string_view name) {
  while (!text.empty()) {
    const std::size_t end = std::min(text.find('\n'), text.size());
    const std::string_view line = text.substr(0, end);
    text.remove_prefix(std::min(end + 1, text.size()));
    const std::size_t colon = line.find(':');
    if (colon != std::string_view::npos && trimmed(line.substr(0, colon)) == name) {
      return trimmed(line.substr(colon + 1));
    }
  }
  return std::nullopt;
}

std::optional<std::int64_t> integerIn(std::optional<std::string_view> text) {
  std::int64_t number = 0;
  if (!text) return std::nullopt;
  const auto [end, error] = std::from_chars(text->data(), text->data() + text->size(), number);
  if (error != std::errc()) return std::nullopt;
  return number;
}

// Parses "seconds.fraction". The fraction may have any number of digits.
std::optional<std::int64_t> millisecondsIn(std::optional<std::string_view> text) {
  constexpr std::int64_t kMaxSeconds = std::numeric_limits<std::int64_t>::max() / 1000 - 1;
  const std::optional<std::int64_t> seconds = integerIn(text);
  if (!seconds || *seconds < 0 || *seconds > kMaxSeconds) return std::nullopt;
  const std::size_t point = std::min(text->find('.'), text->size() - 1);
  std::string digits(text->substr(point + 1, 3));
  digits.resize(3, '0');
  return *seconds * 1000 + integerIn(std::string_view(digits)).value_or(0);
}

std::uint64_t millisecondsAt(std::int64_t frames, std::int64_t rate) {
  if (frames <= 0 || rate <= 0) return 0;
  const auto position = static_cast<std::uint64_t>(frames);
  const auto perSecond = static_cast<std::uint64_t>(rate);
  return position / perSecond * 1000 + position % perSecond * 1000 / perSecond;
}

std::uint64_t timeInState(const PcmStatus& status, std::string_view text, std::string_view parameters) {
  const std::int64_t triggered = millisecondsIn(valueOf(text, "trigger_time")).value_or(0);
  const std::int64_t now = millisecondsIn(valueOf(text, "tstamp")).value_or(0);
  if (triggered > 0 && now > 0) return now > triggered ? static_cast<std::uint64_t>(now - triggered) : 0;
  if (status.state != "RUNNING") return 0;
  return millisecondsAt(status.hardwarePosition, integerIn(valueOf(parameters, "rate")).value_or(0));
}

}  // namespace

std::optional<PcmStatus> PcmStatus::parse(std::string_view status, std::string_view parameters) {
  if (trimmed(status) == kClosed) return PcmStatus{std::string(kClosed)};
  const std::optional<std::string_view> state = valueOf(status, "state");
  const std::optional<std::int64_t> position = integerIn(valueOf(status, "hw_ptr"));
  const std::optional<std::int64_t> delay = integerIn(valueOf(status, "delay"));
  if (!state || state->empty() || !position || !delay) return std::nullopt;
  PcmStatus parsed{std::string(*state), *position, *delay};
  parsed.stateMilliseconds = timeInState(parsed, status, parameters);
  return parsed;
}

}  // namespace tonewerk
