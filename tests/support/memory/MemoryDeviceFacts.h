// SPDX-License-Identifier: Apache-2.0
#pragma once

#include "platform/DeviceFacts.h"
#include "values/Value.h"

namespace tonewerk {

// Gives facts that the test sets before anybody reads them: deviceFacts.set("InternalBuild", true). One
// thread writes, and no other thread reads at that time.
class MemoryDeviceFacts final : public DeviceFacts {
 public:
  std::optional<bool> boolean(std::string_view property) const override {
    const Value* value = facts_.find(property);
    if (value == nullptr || value->asBoolean() == nullptr) return std::nullopt;
    return *value->asBoolean();
  }

  void set(std::string_view property, Value value) { facts_.set(property, std::move(value)); }

 private:
  ValueMap facts_;
};

}  // namespace tonewerk
