// SPDX-License-Identifier: Apache-2.0
#include "platform/linux/log/FairLog.h"

#include <utility>

#include "platform/Clock.h"
#include "platform/LogLines.h"
#include "platform/accounts/Account.h"
#include "platform/accounts/WorkingFor.h"
#include "protocol/RequestSet.h"

namespace tonewerk {
namespace {

constexpr std::string_view kSubsystem = "com.orvane.tonewerk";
constexpr std::string_view kCategory = "twrs";

std::string nameOf(std::uint32_t user) {
  return user == kNoUser ? "unknown users" : "user " + std::to_string(user);
}

std::uint32_t currentUser() {
  const Account* account = WorkingFor::accountIfAny();
  return account == nullptr ? kNoUser : account->user();
}

}  // namespace

FairLog::FairLog(std::unique_ptr<Log> log, const Clock& clock) : LogLayer(std::move(log)), clock_(clock) {}

FairLog::~FairLog() {
  const MutexLock lock(mutex_);
  for (auto& [user, held] : held_) {
    if (held.unsaid > 0) sayCount(user, held);
  }
}

void FairLog::write(std::string_view subsystem, std::string_view category, LogLevel level,
                    std::string_view message) {
  LineAllowance* const lines = LogLines::areKept() ? nullptr : WorkingFor::lines();
  if (lines != nullptr && !lines->takeLine()) return holdBack(currentUser());
  if (hasUnsaid_.load(std::memory_order_relaxed)) sayDueCounts();
  below().write(subsystem, category, level, message);
}

void FairLog::holdBack(std::uint32_t user) {
  const std::chrono::nanoseconds now = clock_.coarseMonotonic();
  const MutexLock lock(mutex_);
  const auto [found, isNew] = held_.try_emplace(user);
  Held& held = found->second;
  if (isNew || now - held.lastAt >= kCountPeriod) {
    say("too many log lines of " + nameOf(user) + ": holding back");
  }
  held.lastAt = now;
  if (held.unsaid++ == 0) held.since = now;
  hasUnsaid_ = true;
  if (now - held.since >= kCountPeriod) sayCount(user, held);
}

void FairLog::sayDueCounts() {
  const std::chrono::nanoseconds now = clock_.coarseMonotonic();
  const MutexLock lock(mutex_);
  bool hasUnsaid = false;
  for (auto& [user, held] : held_) {
    if (held.unsaid == 0) continue;
    if (now - held.since >= kCountPeriod) {
      sayCount(user, held);
    } else {
      hasUnsaid = true;
    }
  }
  hasUnsaid_ = hasUnsaid;
}

void FairLog::sayCount(std::uint32_t user, Held& held) {
  say("log lines of " + nameOf(user) + " held back: " + std::to_string(std::exchange(held.unsaid, 0)));
}

void FairLog::say(const std::string& message) {
  below().write(kSubsystem, kCategory, LogLevel::kError, message);
}

}  // namespace tonewerk
