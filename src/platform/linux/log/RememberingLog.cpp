// SPDX-License-Identifier: Apache-2.0
#include "platform/linux/log/RememberingLog.h"

#include <string>
#include <utility>

#include "platform/Clock.h"
#include "platform/linux/log/RecentLines.h"
#include "platform/linux/log/StreamLog.h"
#include "values/Utf8.h"

namespace tonewerk {

RememberingLog::RememberingLog(std::unique_ptr<Log> log, std::shared_ptr<RecentLines> lines,
                               const Clock& clock)
    : LogLayer(std::move(log)), lines_(std::move(lines)), clock_(clock) {}

RememberingLog::~RememberingLog() = default;

void RememberingLog::write(std::string_view subsystem, std::string_view category, LogLevel level,
                           std::string_view message) {
  // Lines quote tools, files and directories, which need not be UTF-8.
  const std::string text = validUtf8(std::string(message));
  below().write(subsystem, category, level, text);
  lines_->add(StreamLog::format(clock_.now(), category, level, text));
}

}  // namespace tonewerk
