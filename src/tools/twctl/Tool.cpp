// SPDX-License-Identifier: Apache-2.0
#include "tools/twctl/Tool.h"

#include <cstdlib>
#include <ostream>

namespace tonewerk {
namespace {

constexpr const char* kSocketVariable = "TONEWERK_REPORTING_SOCKET";
constexpr const char* kSocketName = "/reporting.sock";

}  // namespace

int Tool::fail(ExitStatus failure, std::string_view problem) const {
  out.flush();
  err << "twctl: " << problem << '\n';
  return failure;
}

void Tool::warn(std::string_view problem) const {
  out.flush();
  err << "twctl: warning: " << problem << '\n';
}

Directories Tool::directories() const {
  return systemWide ? Directories::system() : Directories::fromEnvironment();
}

std::vector<std::string> Tool::socketPaths() const {
  const std::string system = Directories::system().runtime + kSocketName;
  if (systemWide) return {system};
  if (const char* chosen = std::getenv(kSocketVariable); chosen != nullptr && *chosen != '\0')
    return {chosen};
  const std::string own = Directories::fromEnvironment().runtime + kSocketName;
  return own == system ? std::vector{system} : std::vector{own, system};
}

}  // namespace tonewerk
