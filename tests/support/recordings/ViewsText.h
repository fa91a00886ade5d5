// SPDX-License-Identifier: Apache-2.0
#pragma once

#include <string>

namespace tonewerk {

// What the views for people show of the store in `directory`, as lines of text. Each row is a line, with the
// columns that are not null. Without the payloads of events. Empty when there is no store; else what cannot
// be read, in words.
std::string viewsText(const std::string& directory);

}  // namespace tonewerk
