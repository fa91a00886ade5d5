// SPDX-License-Identifier: Apache-2.0
#include "platform/linux/log/JournalLog.h"

#include <cerrno>
#include <sys/stat.h>
#include <sys/uio.h>
#include <syslog.h>
#include <systemd/sd-journal.h>

namespace tonewerk {
namespace {

int priorityOf(LogLevel level) {
  switch (level) {
    case LogLevel::kDebug:
      return LOG_DEBUG;
    case LogLevel::kInfo:
      return LOG_INFO;
    case LogLevel::kDefault:
      return LOG_NOTICE;
    case LogLevel::kError:
      return LOG_ERR;
  }
  return LOG_NOTICE;
}

std::string field(std::string_view name, std::string_view value) {
  std::string text;
  text.reserve(name.size() + 1 + value.size());
  text += name;
  text += '=';
  text += value;
  return text;
}

}  // namespace

bool JournalLog::isJournal(std::string_view journalStream, int fileDescriptor) {
  struct stat status {};
  if (fstat(fileDescriptor, &status) != 0) return false;
  return journalStream == std::to_string(status.st_dev) + ":" + std::to_string(status.st_ino);
}

std::array<std::string, 6> JournalLog::fields(std::string_view subsystem, std::string_view category,
                                              LogLevel level, std::string_view message) {
  return {field("MESSAGE", message),
          field("PRIORITY", std::to_string(priorityOf(level))),
          field("SYSLOG_IDENTIFIER", program_invocation_short_name),
          field("TONEWERK_SUBSYSTEM", subsystem),
          field("TONEWERK_CATEGORY", category),
          field("TONEWERK_LEVEL", textOf(level))};
}

void JournalLog::write(std::string_view subsystem, std::string_view category, LogLevel level,
                       std::string_view message) {
  std::array<std::string, 6> texts = fields(subsystem, category, level, message);
  std::array<iovec, 6> vectors{};
  for (std::size_t at = 0; at < texts.size(); ++at) vectors[at] = {texts[at].data(), texts[at].size()};
  sd_journal_sendv(vectors.data(), static_cast<int>(vectors.size()));
}

}  // namespace tonewerk
