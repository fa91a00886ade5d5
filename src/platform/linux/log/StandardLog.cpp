// SPDX-License-Identifier: Apache-2.0
#include "platform/linux/log/StandardLog.h"

#include <cstdlib>
#include <string>
#include <unistd.h>

#include "platform/Log.h"
#include "platform/linux/log/JournalLog.h"
#include "platform/linux/log/LogThreshold.h"
#include "platform/linux/log/StreamLog.h"

namespace tonewerk {
namespace {

std::string variable(const char* name) {
  const char* value = std::getenv(name);
  return value == nullptr ? std::string() : value;
}

std::unique_ptr<LogOutput> makeLog(const Clock& clock, LogThreshold threshold) {
  if (JournalLog::isJournal(variable("JOURNAL_STREAM"), STDERR_FILENO)) {
    return std::make_unique<JournalLog>(std::move(threshold));
  }
  return std::make_unique<StreamLog>(STDERR_FILENO, clock, std::move(threshold));
}

}  // namespace

std::unique_ptr<LogOutput> makeStandardLog(const Clock& clock) {
  const std::string wanted = variable("TONEWERK_LOG");
  if (wanted.empty()) return makeLog(clock, LogThreshold());
  std::string problem;
  const std::optional<LogThreshold> threshold = LogThreshold::parse(wanted, problem);
  std::unique_ptr<LogOutput> log = makeLog(clock, threshold.value_or(LogThreshold()));
  if (!threshold) {
    const LogCategory category(*log, "com.orvane.tonewerk", "twrs");
    errorLog(category, "TONEWERK_LOG is not understood: %s. Using \"default\".", problem);
  }
  return log;
}

}  // namespace tonewerk
