// SPDX-License-Identifier: Apache-2.0
#include "platform/linux/log/TroubleLog.h"

#include <algorithm>
#include <string>
#include <utility>

#include "platform/Clock.h"
#include "platform/accounts/Account.h"
#include "platform/accounts/WorkingFor.h"
#include "values/ShortenedText.h"
#include "values/Utf8.h"

namespace tonewerk {

void RecentTroubles::add(LoggedTrouble line) {
  const MutexLock lock(mutex_);
  const auto same = std::find_if(lines_.begin(), lines_.end(), [&](const LoggedTrouble& known) {
    return known.text == line.text && known.category == line.category && known.user == line.user;
  });
  if (same != lines_.end()) {
    line.times += same->times;
    lines_.erase(same);
  }
  lines_.push_front(std::move(line));
  if (lines_.size() > kMaxLines) lines_.pop_back();
}

std::vector<LoggedTrouble> RecentTroubles::all() const {
  const MutexLock lock(mutex_);
  return {lines_.begin(), lines_.end()};
}

TroubleLog::TroubleLog(std::unique_ptr<Log> log, std::shared_ptr<RecentTroubles> troubles, const Clock& clock)
    : LogLayer(std::move(log)), troubles_(std::move(troubles)), clock_(clock) {}

TroubleLog::~TroubleLog() = default;

void TroubleLog::write(std::string_view subsystem, std::string_view category, LogLevel level,
                       std::string_view message) {
  below().write(subsystem, category, level, message);
  if (level != LogLevel::kError) return;
  // The place of the line is aligned with spaces.
  message.remove_prefix(std::min(message.find_first_not_of(' '), message.size()));
  const Account* account = WorkingFor::accountIfAny();
  troubles_->add(
      {.lastAt = clock_.now(),
       .category = std::string(category),
       .text = std::string(shortened(validUtf8(std::string(message)), RecentTroubles::kMaxTextBytes)),
       .user = account == nullptr ? std::nullopt : std::optional(account->user())});
}

}  // namespace tonewerk
