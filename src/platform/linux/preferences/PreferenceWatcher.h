// SPDX-License-Identifier: Apache-2.0
#pragma once

#include "platform/Log.h"
#include "platform/linux/notifications/DirectoryWatcher.h"

namespace tonewerk {

class TomlPreferenceStore;

// Has the store look at a preference file whenever somebody has written it, so that one that does not parse
// is logged while its writer still looks at it. What is there at the start is looked at, too.
class PreferenceWatcher {
 public:
  // Both outlive the watcher.
  PreferenceWatcher(const TomlPreferenceStore& store, const LogCategory& log);

 private:
  DirectoryWatcher configured_;
  DirectoryWatcher written_;
};

}  // namespace tonewerk
