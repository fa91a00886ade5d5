// SPDX-License-Identifier: Apache-2.0
#pragma once

#include <fnmatch.h>
#include <optional>
#include <string>

namespace tonewerk {

// Whether a pattern (*, ?, [...]) fits the whole text. Without a pattern every text fits. As in the store's
// patterns, a backslash is a character like others.
inline bool fitsPattern(const std::optional<std::string>& pattern, const std::string& text) {
  return !pattern || ::fnmatch(pattern->c_str(), text.c_str(), FNM_NOESCAPE) == 0;
}

}  // namespace tonewerk
