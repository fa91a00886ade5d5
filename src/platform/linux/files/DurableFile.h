// SPDX-License-Identifier: Apache-2.0
#pragma once

#include <string>
#include <string_view>
#include <system_error>

namespace tonewerk {

// Puts `text` into the file `name` of `directory` so that readers, also after a crash, see the old file or
// the new one and nothing between: writes "<name>.new", syncs it and renames it. One writer at a time. The
// file of root belongs to whom the directory belongs to.
[[nodiscard]] std::error_code replaceFile(const std::string& directory, const std::string& name,
                                          std::string_view text);

}  // namespace tonewerk
