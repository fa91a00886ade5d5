// SPDX-License-Identifier: Apache-2.0
#pragma once

#include <optional>
#include <string_view>

namespace tonewerk {

// Properties of the device, such as "InternalBuild"; they change at most by a reload. Any thread.
class DeviceFacts {
 public:
  virtual ~DeviceFacts() = default;

  // None when the property is missing or no boolean.
  virtual std::optional<bool> boolean(std::string_view property) const = 0;
};

}  // namespace tonewerk
