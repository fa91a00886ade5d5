// SPDX-License-Identifier: Apache-2.0
#include "platform/linux/TextCache.h"

#include "platform/linux/Utf8.h"

namespace tonewerk {

std::optional<SharedString> TextCache::find(std::string_view text) {
  if (text.size() > mostBytes_) return isUtf8(text) ? std::optional<SharedString>(text) : std::nullopt;
  SharedString& slot = slots_[SharedString::hashOf(text) & (slots_.size() - 1)];
  if (slot == text) return slot;
  if (!isUtf8(text)) return std::nullopt;
  slot = SharedString(text);
  return slot;
}

}  // namespace tonewerk
