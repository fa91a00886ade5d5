// SPDX-License-Identifier: Apache-2.0
#pragma once

#include <string>

#include "platform/DeviceFacts.h"
#include "platform/Log.h"
#include "platform/linux/preferences/TomlFile.h"
#include "values/Mutex.h"

namespace tonewerk {

// Reads device facts from a TOML file: in the constructor, and again in readAgain(). A missing file states no
// facts. A file that cannot be parsed is logged and states no facts either. Facts that the daemon does not
// know, and those that are not booleans, are logged. Any thread.
class TomlDeviceFacts final : public DeviceFacts {
 public:
  // `log` must outlive this object.
  TomlDeviceFacts(std::string path, const LogCategory& log);

  [[nodiscard]] std::optional<bool> boolean(std::string_view property) const override;

  void readAgain();

 private:
  const LogCategory& log_;
  mutable Mutex mutex_;
  TomlFile file_ GUARDED_BY(mutex_);
};

}  // namespace tonewerk
