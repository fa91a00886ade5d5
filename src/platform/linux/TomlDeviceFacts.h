// SPDX-License-Identifier: Apache-2.0
#pragma once

#include <string>

#include "platform/DeviceFacts.h"
#include "platform/LogCategory.h"
#include "values/Value.h"

namespace tonewerk {

// Facts out of a TOML file, read once. A missing file states none; one that does not parse is logged and
// states none.
class TomlDeviceFacts final : public DeviceFacts {
 public:
  TomlDeviceFacts(std::string path, const LogCategory& log);

  std::optional<bool> boolean(std::string_view property) const override;

 private:
  ValueMap facts_;
};

}  // namespace tonewerk
