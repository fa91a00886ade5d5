// SPDX-License-Identifier: Apache-2.0
#include "platform/linux/TomlDeviceFacts.h"

#include "platform/linux/TomlFile.h"

namespace tonewerk {

TomlDeviceFacts::TomlDeviceFacts(std::string path, const LogCategory& log) {
  TomlFile file(std::move(path), log);
  file.refresh();
  facts_ = file.values();
}

std::optional<bool> TomlDeviceFacts::boolean(std::string_view property) const {
  const Value* value = facts_.find(property);
  if (value == nullptr || value->asBoolean() == nullptr) return std::nullopt;
  return *value->asBoolean();
}

}  // namespace tonewerk
