// SPDX-License-Identifier: Apache-2.0
#include "platform/linux/log/CondensingLog.h"

#include <utility>

#include "platform/Clock.h"

namespace tonewerk {

CondensingLog::CondensingLog(std::unique_ptr<Log> log, const Clock& clock)
    : LogLayer(std::move(log)), clock_(clock) {}

CondensingLog::~CondensingLog() {
  const MutexLock lock(mutex_);
  writeCount();
}

void CondensingLog::write(std::string_view subsystem, std::string_view category, LogLevel level,
                          std::string_view message) {
  const MutexLock lock(mutex_);
  if (isCounted(category, level, message)) return;
  below().write(subsystem, category, level, message);
  if (equalLines_ > 1) return;
  last_.subsystem = subsystem;
  last_.category = category;
  last_.level = level;
  last_.message = message;
}

bool CondensingLog::isCounted(std::string_view category, LogLevel level, std::string_view message) {
  const bool isEqual = last_.message == message && last_.category == category && last_.level == level;
  if (!isEqual || equalLines_ == 0) {
    writeCount();
    equalLines_ = 1;
    return false;
  }
  if (++equalLines_ <= kMaxEqualLines) return false;
  const std::chrono::nanoseconds now = clock_.coarseMonotonic();
  if (unsaid_++ == 0) saidAt_ = now;
  if (now - saidAt_ >= kCountPeriod) writeCount();
  return true;
}

void CondensingLog::writeCount() {
  if (unsaid_ == 0) return;
  below().write(last_.subsystem, last_.category, last_.level,
                "equal lines left out: " + std::to_string(std::exchange(unsaid_, 0)));
}

}  // namespace tonewerk
