// SPDX-License-Identifier: Apache-2.0
#pragma once

#include <optional>
#include <string_view>

namespace tonewerk {

// Gives properties of the device, such as "InternalBuild". Only a reload may change them. Any thread.
class DeviceFacts {
 public:
  virtual ~DeviceFacts() = default;

  // Returns none when the property is missing or is not a boolean.
  virtual std::optional<bool> boolean(std::string_view property) const = 0;
};

}  // namespace tonewerk
