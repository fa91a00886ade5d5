// SPDX-License-Identifier: Apache-2.0
#pragma once

#include <optional>
#include <string>

#include "tools/recording/Recording.h"

namespace tonewerk {

// Reads a recording from a file. None when that fails; `problem` is then "line 3: why" or the system's words,
// without the file's name.
[[nodiscard]] std::optional<Recording> readRecordingFile(const std::string& file, const RequestSet& interface,
                                                         const JsonService& json, std::string& problem);

}  // namespace tonewerk
