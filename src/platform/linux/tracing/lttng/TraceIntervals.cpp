// SPDX-License-Identifier: Apache-2.0
#include "platform/linux/tracing/lttng/TraceIntervals.h"

#include <charconv>
#include <system_error>

namespace tonewerk {
namespace {

constexpr std::string_view kName = "name ";
constexpr std::string_view kProblem = "problem ";
constexpr std::string_view kEnd = "end";

std::string unescaped(std::string_view text) {
  std::string name;
  for (std::size_t at = 0; at < text.size(); ++at) {
    const bool isEscape = text[at] == '\\' && at + 1 < text.size();
    if (!isEscape) {
      name += text[at];
    } else {
      name += text[++at] == 'n' ? '\n' : text[at];
    }
  }
  return name;
}

// Parses a decimal number at the beginning of `text` and removes it.
template <typename Number>
bool takeNumber(std::string_view& text, Number& number) {
  const auto [end, error] = std::from_chars(text.data(), text.data() + text.size(), number);
  if (error != std::errc()) return false;
  text.remove_prefix(static_cast<std::size_t>(end - text.data()));
  return true;
}

bool takeSpace(std::string_view& text) {
  if (!text.starts_with(' ')) return false;
  text.remove_prefix(1);
  return true;
}

class Parser {
 public:
  // Parses a line with a name or an interval. False for any other line.
  bool take(std::string_view line) {
    if (line.starts_with(kName)) {
      byIndex_.push_back(&intervals_[unescaped(line.substr(kName.size()))]);
      return true;
    }
    std::size_t index = 0;
    TraceInterval interval;
    std::int64_t sincePrevious = 0;
    const bool isInterval = takeNumber(line, index) && index < byIndex_.size() && takeSpace(line) &&
                            takeNumber(line, interval.duration) && takeSpace(line) &&
                            takeNumber(line, sincePrevious) && line.empty() &&
                            !__builtin_add_overflow(previousEnd_, sincePrevious, &interval.end);
    if (!isInterval) return false;
    previousEnd_ = interval.end;
    byIndex_[index]->push_back(interval);
    return true;
  }

  TraceIntervals take() { return std::move(intervals_); }

 private:
  TraceIntervals intervals_;
  // Point into intervals_; a map does not move its entries.
  std::vector<std::vector<TraceInterval>*> byIndex_;
  std::int64_t previousEnd_ = 0;
};

}  // namespace

std::optional<TraceIntervals> parseTraceIntervals(std::string_view text, std::string& problem) {
  Parser parser;
  while (!text.empty()) {
    const std::size_t end = text.find('\n');
    if (end == std::string_view::npos) break;
    const std::string_view line = text.substr(0, end);
    text.remove_prefix(end + 1);
    if (line == kEnd && text.empty()) return parser.take();
    if (line.starts_with(kProblem)) {
      problem = unescaped(line.substr(kProblem.size()));
      return std::nullopt;
    }
    if (!parser.take(line)) break;
  }
  problem = "the trace reader's answer is not whole";
  return std::nullopt;
}

}  // namespace tonewerk
