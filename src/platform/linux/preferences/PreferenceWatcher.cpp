// SPDX-License-Identifier: Apache-2.0
#include "platform/linux/preferences/PreferenceWatcher.h"

#include <string_view>

#include "platform/linux/preferences/TomlPreferenceStore.h"

namespace tonewerk {

PreferenceWatcher::PreferenceWatcher(const TomlPreferenceStore& store, const LogCategory& log)
    : configured_(
          store.configurationDirectory(), [&store](std::string_view name) { store.checkFile(name); },
          [&store] { store.checkAllFiles(); }, log),
      written_(
          store.stateDirectory(), [&store](std::string_view name) { store.checkFile(name); },
          [&store] { store.checkAllFiles(); }, log) {
  store.checkAllFiles();
}

}  // namespace tonewerk
