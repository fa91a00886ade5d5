// SPDX-License-Identifier: Apache-2.0
#include "client/SocketPaths.h"

#include <cstdlib>
#include <optional>
#include <unistd.h>

#include "platform/linux/directories/Directories.h"

namespace tonewerk {
namespace {

constexpr const char* kSocketVariable = "TONEWERK_REPORTING_SOCKET";
constexpr const char* kSocketName = "/reporting.sock";

std::optional<std::string> variable(const std::string& name) {
  const char* value = ::secure_getenv(name.c_str());
  return value == nullptr ? std::nullopt : std::optional<std::string>(value);
}

}  // namespace

std::vector<std::string> defaultSocketPaths() {
  const std::optional<std::string> chosen = variable(kSocketVariable);
  if (chosen && !chosen->empty()) return {*chosen};
  const std::string own = Directories::from(variable, ::geteuid()).runtime + kSocketName;
  const std::string system = Directories::system().runtime + kSocketName;
  return own == system ? std::vector{system} : std::vector{own, system};
}

}  // namespace tonewerk
