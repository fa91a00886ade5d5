// SPDX-License-Identifier: Apache-2.0
#include "platform/linux/diagnostics/CapturePolicy.h"

#include <cmath>

#include "platform/Clock.h"

namespace tonewerk {
namespace {

constexpr double kSecondsADay = 86'400.0;

}  // namespace

std::int64_t CapturePolicy::dayOf(const Clock& clock) {
  return static_cast<std::int64_t>(std::floor(clock.now() / kSecondsADay));
}

FaultsignError CapturePolicy::judge(const FaultsignSignature& signature, double duration) {
  if (!isValid(signature, duration)) return kFaultsignErrorInvalidParameters;
  beginDay();
  if (count_.accepted >= kMaxPerDay) return kFaultsignErrorDailyLimitExceeded;
  forgetOld();
  if (accepted_.contains(keyOf(signature))) return kFaultsignErrorRequestThrottled;
  return kFaultsignErrorNone;
}

CapturePolicy::Acceptance CapturePolicy::accept(const FaultsignSignature& signature) {
  beginDay();
  ++count_.accepted;
  return accepted_[keyOf(signature)] = clock_.monotonic();
}

// If a later capture with the same signature was accepted meanwhile, its acceptance stays.
void CapturePolicy::withdraw(const FaultsignSignature& signature, Acceptance acceptance) {
  const auto found = accepted_.find(keyOf(signature));
  if (found != accepted_.end() && found->second == acceptance) accepted_.erase(found);
}

bool CapturePolicy::isValid(const FaultsignSignature& signature, double duration) {
  // NaN fails every comparison.
  const bool isDuration = duration >= 0.0 && duration <= kLongestDuration;
  return isDuration && !signature.domain.empty() && !signature.type.empty() && !signature.subType.empty();
}

// Writes each text after its length, so that different signatures have different keys.
std::string CapturePolicy::keyOf(const FaultsignSignature& signature) {
  std::string key;
  for (const std::string* text :
       {&signature.domain, &signature.type, &signature.subType, &signature.subtypeContext}) {
    key += std::to_string(text->size()) + ":" + *text;
  }
  return signature.detectedProcess ? key + "@" + *signature.detectedProcess : key;
}

void CapturePolicy::beginDay() {
  const std::int64_t today = dayOf(clock_);
  if (count_.day != today) count_ = {today, 0};
}

void CapturePolicy::forgetOld() {
  const std::chrono::nanoseconds now = clock_.monotonic();
  std::erase_if(accepted_, [now](const auto& entry) { return now - entry.second >= kMinimumInterval; });
}

}  // namespace tonewerk
