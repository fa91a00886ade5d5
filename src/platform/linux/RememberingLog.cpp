// SPDX-License-Identifier: Apache-2.0
#include "platform/linux/RememberingLog.h"

#include <utility>

#include "platform/Clock.h"
#include "platform/linux/RecentLines.h"
#include "platform/linux/StreamLog.h"

namespace tonewerk {

RememberingLog::RememberingLog(std::unique_ptr<Log> log, std::shared_ptr<RecentLines> lines,
                               const Clock& clock)
    : log_(std::move(log)), lines_(std::move(lines)), clock_(clock) {}

RememberingLog::~RememberingLog() = default;

void RememberingLog::write(std::string_view subsystem, std::string_view category, LogLevel level,
                           std::string_view message) {
  log_->write(subsystem, category, level, message);
  lines_->add(StreamLog::format(clock_.now(), category, level, message));
}

}  // namespace tonewerk
