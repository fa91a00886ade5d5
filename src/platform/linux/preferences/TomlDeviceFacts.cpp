// SPDX-License-Identifier: Apache-2.0
#include "platform/linux/preferences/TomlDeviceFacts.h"

#include <utility>

namespace tonewerk {

TomlDeviceFacts::TomlDeviceFacts(std::string path, const LogCategory& log) : file_(std::move(path), log) {
  file_.refresh();
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
}

}  // namespace tonewerk
