// SPDX-License-Identifier: Apache-2.0
#include "platform/linux/log/StreamLog.h"

#include <array>
#include <cerrno>
#include <cmath>
#include <cstdio>
#include <ctime>
#include <poll.h>
#include <unistd.h>

namespace tonewerk {
namespace {

// How long a line waits for a full, non-blocking pipe before it is lost.
constexpr int kMaxWaitMilliseconds = 100;

std::string timeText(double at) {
  const double whole = std::floor(at);
  // Cut and not rounded, so that a log's time is never in the future.
  const int micros = static_cast<int>((at - whole) * 1e6);
  const auto seconds = static_cast<std::time_t>(whole);
  std::tm utc{};
  gmtime_r(&seconds, &utc);
  std::array<char, 64> text{};
  const std::size_t size = std::strftime(text.data(), text.size(), "%Y-%m-%dT%H:%M:%S", &utc);
  std::snprintf(text.data() + size, text.size() - size, ".%06dZ", micros);
  return text.data();
}

bool becomesWritable(int fileDescriptor) {
  pollfd waited{fileDescriptor, POLLOUT, 0};
  return poll(&waited, 1, kMaxWaitMilliseconds) == 1;
}

void writeAll(int fileDescriptor, std::string_view text) {
  while (!text.empty()) {
    const ssize_t written = ::write(fileDescriptor, text.data(), text.size());
    if (written >= 0) {
      text.remove_prefix(static_cast<std::size_t>(written));
    } else if (errno == EAGAIN) {
      if (!becomesWritable(fileDescriptor)) return;
    } else if (errno != EINTR) {
      return;
    }
  }
}

}  // namespace

StreamLog::StreamLog(int fileDescriptor, const Clock& clock, LogThreshold threshold)
    : fileDescriptor_(fileDescriptor), clock_(clock), threshold_(std::move(threshold)) {}

std::string StreamLog::format(double at, std::string_view category, LogLevel level,
                              std::string_view message) {
  std::string line = timeText(at);
  line.reserve(line.size() + category.size() + message.size() + 16);
  line += ' ';
  line += textOf(level);
  line += ' ';
  line += category;
  line += ' ';
  line += message;
  line += '\n';
  return line;
}

void StreamLog::write(std::string_view, std::string_view category, LogLevel level, std::string_view message) {
  const std::string line = format(clock_.now(), category, level, message);
  const MutexLock lock(mutex_);
  writeAll(fileDescriptor_, line);
}

}  // namespace tonewerk
