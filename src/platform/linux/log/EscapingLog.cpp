// SPDX-License-Identifier: Apache-2.0
#include "platform/linux/log/EscapingLog.h"

#include <string>
#include <utility>

#include "platform/LogLines.h"
#include "values/PrintableText.h"

namespace tonewerk {

EscapingLog::EscapingLog(std::unique_ptr<Log> log) : LogLayer(std::move(log)) {}

EscapingLog::~EscapingLog() = default;

void EscapingLog::write(std::string_view subsystem, std::string_view category, LogLevel level,
                        std::string_view message) {
  if (isPrintable(message)) return below().write(subsystem, category, level, message);
  std::string text(message);
  text = LogLines::areKept() ? printableLines(std::move(text)) : printable(std::move(text));
  below().write(subsystem, category, level, text);
}

}  // namespace tonewerk
