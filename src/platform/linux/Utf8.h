// SPDX-License-Identifier: Apache-2.0
#pragma once

#include <string_view>

namespace tonewerk {

// Whether `text` is well-formed UTF-8: no overlong forms, no surrogates, nothing above U+10FFFF. Zero bytes
// are text.
bool isUtf8(std::string_view text);

}  // namespace tonewerk
