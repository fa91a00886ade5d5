// SPDX-License-Identifier: Apache-2.0
#pragma once

#include "platform/Log.h"
#include "platform/linux/notifications/DirectoryWatcher.h"

namespace tonewerk {

class TomlPreferenceStore;

// Lets the store check each preference file after it was written. So a file that cannot be parsed is logged
// at once, while its author is still working on it. The files that exist at the start are checked, too.
class PreferenceWatcher {
 public:
  // Both must outlive the watcher.
  PreferenceWatcher(const TomlPreferenceStore& store, const LogCategory& log);

 private:
  DirectoryWatcher configured_;
  DirectoryWatcher written_;
};

}  // namespace tonewerk
