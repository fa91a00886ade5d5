// SPDX-License-Identifier: Apache-2.0
#include "platform/linux/directories/SocketPaths.h"

#include <optional>

namespace tonewerk {
namespace {

constexpr const char* kSocketVariable = "TONEWERK_REPORTING_SOCKET";
constexpr const char* kSocketName = "/reporting.sock";

}  // namespace

std::string socketPathOf(const Directories& directories) { return directories.runtime + kSocketName; }

std::vector<std::string> socketPathsFrom(const Directories::Environment& environment, uid_t user) {
  const std::optional<std::string> chosen = environment(kSocketVariable);
  if (chosen && !chosen->empty()) return {*chosen};
  const std::string own = socketPathOf(Directories::from(environment, user));
  const std::string system = socketPathOf(Directories::system());
  return own == system ? std::vector{system} : std::vector{own, system};
}

}  // namespace tonewerk
