// SPDX-License-Identifier: Apache-2.0
#include "support/memory/MemoryLog.h"

#include <functional>

namespace tonewerk {
namespace {

bool isDigit(char c) { return c >= '0' && c <= '9'; }

template <typename Predicate>
std::vector<MemoryLog::Line> select(const std::vector<MemoryLog::Line>& lines, Predicate wanted) {
  std::vector<MemoryLog::Line> selected;
  for (const MemoryLog::Line& line : lines) {
    if (wanted(line)) selected.push_back(line);
  }
  return selected;
}

std::vector<std::string> textsOfLines(const std::vector<MemoryLog::Line>& lines) {
  std::vector<std::string> texts;
  texts.reserve(lines.size());
  for (const MemoryLog::Line& line : lines) texts.push_back(line.text());
  return texts;
}

}  // namespace

std::string MemoryLog::withoutPrefix(std::string_view message) {
  constexpr std::size_t kNameWidth = 25;
  constexpr std::size_t kLineWidth = 5;
  const std::size_t colon = message.find(':');
  if (colon == std::string_view::npos || colon < kNameWidth) return std::string(message);
  std::size_t at = colon + 1;
  while (at < message.size() && isDigit(message[at])) ++at;
  if (at == colon + 1) return std::string(message);
  while (at < message.size() && message[at] == ' ' && at < colon + 1 + kLineWidth) ++at;
  if (at < colon + 1 + kLineWidth || at == message.size() || message[at] != ' ') return std::string(message);
  return std::string(message.substr(at + 1));
}

bool MemoryLog::isEnabled(std::string_view category, LogLevel level) const {
  const MutexLock lock(mutex_);
  const auto own = thresholds_.find(category);
  return level >= (own == thresholds_.end() ? threshold_ : own->second);
}

void MemoryLog::write(std::string_view subsystem, std::string_view category, LogLevel level,
                      std::string_view message) {
  const MutexLock lock(mutex_);
  lines_.push_back({std::string(subsystem), std::string(category), level, std::string(message)});
}

void MemoryLog::setThreshold(LogLevel level) {
  const MutexLock lock(mutex_);
  threshold_ = level;
}

void MemoryLog::setThreshold(std::string_view category, LogLevel level) {
  const MutexLock lock(mutex_);
  thresholds_[std::string(category)] = level;
}

std::vector<MemoryLog::Line> MemoryLog::lines() const {
  const MutexLock lock(mutex_);
  return lines_;
}

std::vector<MemoryLog::Line> MemoryLog::linesOf(std::string_view category) const {
  return select(lines(), [&](const Line& line) { return line.category == category; });
}

std::vector<MemoryLog::Line> MemoryLog::linesOf(std::string_view category, LogLevel level) const {
  return select(lines(), [&](const Line& line) { return line.category == category && line.level == level; });
}

std::vector<std::string> MemoryLog::textsOf(std::string_view category) const {
  return textsOfLines(linesOf(category));
}

std::vector<std::string> MemoryLog::textsOf(std::string_view category, LogLevel level) const {
  return textsOfLines(linesOf(category, level));
}

std::vector<std::string> MemoryLog::textsAt(LogLevel level) const {
  return textsOfLines(select(lines(), [&](const Line& line) { return line.level == level; }));
}

void MemoryLog::clear() {
  const MutexLock lock(mutex_);
  lines_.clear();
}

}  // namespace tonewerk
