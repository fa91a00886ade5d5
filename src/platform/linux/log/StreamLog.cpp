// SPDX-License-Identifier: Apache-2.0
#include "platform/linux/log/StreamLog.h"

#include <cerrno>
#include <chrono>
#include <cmath>
#include <cstdint>
#include <poll.h>
#include <unistd.h>

namespace tonewerk {
namespace {

// How long a line waits for a full, non-blocking pipe before it is lost.
constexpr int kMaxWaitMilliseconds = 100;

// Writes the lowest digits of `number` before `end`. Returns their beginning.
template <int kDigits>
char* putBefore(char* end, unsigned number) {
  for (int digit = 0; digit < kDigits; ++digit, number /= 10) *--end = static_cast<char>('0' + number % 10);
  return end;
}

// For years from 0 to 9999. By hand, because a line is formatted often and strftime() takes longer than the
// rest of it.
std::string timeText(double at) {
  const double whole = std::floor(at);
  // Cut and not rounded, so that a log's time is never in the future.
  const auto micros = static_cast<unsigned>((at - whole) * 1e6);
  const std::chrono::sys_seconds seconds{std::chrono::seconds(static_cast<std::int64_t>(whole))};
  const auto day = std::chrono::floor<std::chrono::days>(seconds);
  const std::chrono::year_month_day date{day};
  const std::chrono::hh_mm_ss time{seconds - day};

  std::string text("0000-00-00T00:00:00.000000Z");
  char* place = text.data() + text.size() - 1;
  place = putBefore<6>(place, micros) - 1;
  place = putBefore<2>(place, static_cast<unsigned>(time.seconds().count())) - 1;
  place = putBefore<2>(place, static_cast<unsigned>(time.minutes().count())) - 1;
  place = putBefore<2>(place, static_cast<unsigned>(time.hours().count())) - 1;
  place = putBefore<2>(place, static_cast<unsigned>(date.day())) - 1;
  place = putBefore<2>(place, static_cast<unsigned>(date.month())) - 1;
  putBefore<4>(place, static_cast<unsigned>(static_cast<int>(date.year())));
  return text;
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

void StreamLog::writeAt(double at, std::string_view, std::string_view category, LogLevel level,
                        std::string_view message) {
  const std::string line = format(at, category, level, message);
  const MutexLock lock(mutex_);
  writeAll(fileDescriptor_, line);
}

}  // namespace tonewerk
