// SPDX-License-Identifier: Apache-2.0
#include "tools/twctl/Tool.h"

#include <cstdlib>
#include <optional>
#include <ostream>
#include <unistd.h>

#include "platform/linux/directories/SocketPaths.h"
#include "values/PrintableText.h"

namespace tonewerk {
namespace {

std::optional<std::string> variable(const std::string& name) {
  const char* value = std::getenv(name.c_str());
  return value == nullptr ? std::nullopt : std::optional<std::string>(value);
}

}  // namespace

int Tool::fail(ExitStatus failure, std::string_view problem) const {
  out.flush();
  err << "twctl: " << printable(std::string(problem)) << '\n';
  return failure;
}

void Tool::warn(std::string_view problem) const {
  out.flush();
  err << "twctl: warning: " << printable(std::string(problem)) << '\n';
}

Directories Tool::directories() const {
  return systemWide ? Directories::system() : Directories::fromEnvironment();
}

std::vector<std::string> Tool::socketPaths() const {
  if (systemWide) return {socketPathOf(Directories::system())};
  return socketPathsFrom(variable, ::geteuid());
}

}  // namespace tonewerk
