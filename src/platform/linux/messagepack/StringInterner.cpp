// SPDX-License-Identifier: Apache-2.0
#include "platform/linux/messagepack/StringInterner.h"

#include "values/Utf8.h"

namespace tonewerk {

std::optional<SharedString> StringInterner::find(std::string_view text) {
  if (text.size() > maxBytes_) return isText(text) ? std::optional<SharedString>(text) : std::nullopt;
  std::size_t& guess = slots_[last_].next;
  last_ = guess;
  if (slots_[guess].text == text) return slots_[guess].text;
  guess = SharedString::hashOf(text) & (slots_.size() - 1);
  last_ = guess;
  SharedString& kept = slots_[guess].text;
  if (kept == text) return kept;
  if (!isText(text)) return std::nullopt;
  kept = SharedString(text);
  return kept;
}

}  // namespace tonewerk
