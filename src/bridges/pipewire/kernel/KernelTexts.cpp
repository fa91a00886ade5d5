// SPDX-License-Identifier: Apache-2.0
#include "bridges/pipewire/kernel/KernelTexts.h"

#include <algorithm>
#include <charconv>
#include <limits>
#include <system_error>

namespace tonewerk {
namespace {

constexpr std::uint64_t kKernelThread = 0x00200000;  // PF_KTHREAD of the kernel's flags

// Gives the words of a text one by one; empty ones after the last.
class Words {
 public:
  explicit Words(std::string_view text) : rest_(text) {}

  std::string_view next() {
    constexpr std::string_view kWhiteSpace = " \t\n";
    rest_.remove_prefix(std::min(rest_.find_first_not_of(kWhiteSpace), rest_.size()));
    const std::string_view word = rest_.substr(0, rest_.find_first_of(kWhiteSpace));
    rest_.remove_prefix(word.size());
    return word;
  }
  std::string_view skip(int words) {
    for (int i = 0; i < words; ++i) next();
    return next();
  }

 private:
  std::string_view rest_;
};

template <typename Number>
std::optional<Number> wholeNumber(std::string_view word) {
  Number number{};
  const auto [end, error] = std::from_chars(word.data(), word.data() + word.size(), number);
  if (error != std::errc() || end != word.data() + word.size()) return std::nullopt;
  return number;
}

std::optional<std::chrono::nanoseconds> nanosecondsIn(std::string_view word, std::uint64_t unit) {
  const auto number = wholeNumber<std::uint64_t>(word);
  if (!number || *number > std::numeric_limits<std::int64_t>::max() / unit) return std::nullopt;
  return std::chrono::nanoseconds(static_cast<std::int64_t>(*number * unit));
}

}  // namespace

std::optional<ThreadStat> threadStatIn(std::string_view text) {
  const std::size_t opening = text.find('(');
  const std::size_t closing = text.rfind(')');
  if (opening == std::string_view::npos || closing == std::string_view::npos || closing < opening)
    return std::nullopt;
  Words words(text.substr(closing + 1));
  const std::string_view state = words.next();
  if (state.size() != 1) return std::nullopt;
  ThreadStat stat;
  stat.name = nameIn(text.substr(opening + 1, closing - opening - 1));
  stat.state = state.front() > ' ' && state.front() <= '~' ? state.front() : '?';
  const std::uint64_t flags = wholeNumber<std::uint64_t>(words.skip(5)).value_or(0);
  stat.isOfKernel = (flags & kKernelThread) != 0;
  stat.majorFaults = wholeNumber<std::uint64_t>(words.skip(2)).value_or(0);
  stat.processor = wholeNumber<std::int32_t>(words.skip(26)).value_or(-1);
  stat.priority = wholeNumber<std::int32_t>(words.next()).value_or(0);
  const auto policy = wholeNumber<std::int32_t>(words.next());
  if (!policy) return std::nullopt;
  stat.policy = *policy;
  return stat;
}

std::optional<ThreadTimes> threadTimesIn(std::string_view text) {
  Words words(text);
  const auto ran = nanosecondsIn(words.next(), 1);
  const auto waited = nanosecondsIn(words.next(), 1);
  if (!ran || !waited) return std::nullopt;
  return ThreadTimes{*ran, *waited};
}

std::optional<std::chrono::nanoseconds> pressureIn(std::string_view text) {
  constexpr std::string_view kTotal = "total=";
  if (!text.starts_with("some ")) return std::nullopt;
  const std::string_view line = text.substr(0, text.find('\n'));
  const std::size_t total = line.find(kTotal);
  if (total == std::string_view::npos) return std::nullopt;
  return nanosecondsIn(line.substr(total + kTotal.size()), 1000);
}

std::optional<std::uint64_t> countIn(std::string_view text) {
  return wholeNumber<std::uint64_t>(Words(text).next());
}

ThreadName nameIn(std::string_view text) {
  ThreadName name;
  text = text.substr(0, std::min(text.find('\n'), name.bytes.size() - 1));
  std::copy(text.begin(), text.end(), name.bytes.begin());
  return name;
}

}  // namespace tonewerk
