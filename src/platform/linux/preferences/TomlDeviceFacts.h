// SPDX-License-Identifier: Apache-2.0
#pragma once

#include <string>

#include "platform/DeviceFacts.h"
#include "platform/Log.h"
#include "platform/linux/preferences/TomlFile.h"
#include "values/Mutex.h"

namespace tonewerk {

// Facts out of a TOML file, read when it is made and when somebody asks for it. A missing file states none;
// one that does not parse is logged and states none.
class TomlDeviceFacts final : public DeviceFacts {
 public:
  // `log` outlives the facts.
  TomlDeviceFacts(std::string path, const LogCategory& log);

  [[nodiscard]] std::optional<bool> boolean(std::string_view property) const override;

  void readAgain();

 private:
  mutable Mutex mutex_;
  TomlFile file_ GUARDED_BY(mutex_);
};

}  // namespace tonewerk
