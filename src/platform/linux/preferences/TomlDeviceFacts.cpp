// SPDX-License-Identifier: Apache-2.0
#include "platform/linux/preferences/TomlDeviceFacts.h"

#include <utility>

#include "platform/PreferenceSchema.h"

namespace tonewerk {

TomlDeviceFacts::TomlDeviceFacts(std::string path, const LogCategory& log)
    : log_(log), file_(std::move(path), log) {
  readAgain();
}

std::optional<bool> TomlDeviceFacts::boolean(std::string_view property) const {
  const MutexLock lock(mutex_);
  const Value* value = file_.values().find(property);
  if (value == nullptr || value->asBoolean() == nullptr) return std::nullopt;
  return *value->asBoolean();
}

void TomlDeviceFacts::readAgain() {
  const MutexLock lock(mutex_);
  file_.refresh();
  for (const std::string& line : unknownKeys(kDeviceFacts, file_.values())) errorLog(log_, "%@", line);
  for (const Preference& fact : deviceFactSchema()) {
    const Value* value = file_.values().find(fact.key);
    const std::optional<std::string> problem = value == nullptr ? std::nullopt : problemWith(fact, *value);
    if (problem) errorLog(log_, "%@: %@", kDeviceFacts, *problem);
  }
}

}  // namespace tonewerk
