// SPDX-License-Identifier: Apache-2.0
#pragma once

#include <string>
#include <string_view>
#include <system_error>

namespace tonewerk {

// Replaces the contents of the file `name` in `directory` with `text`. Readers see either the old file or the
// new one, even after a crash: the function writes "<name>.new", syncs it and renames it. Only one writer at
// a time may call it. When the process is root, the new file gets the directory's owner and group.
[[nodiscard]] std::error_code replaceFile(const std::string& directory, const std::string& name,
                                          std::string_view text);

}  // namespace tonewerk
