// SPDX-License-Identifier: Apache-2.0
#include "tools/twctl/Tool.h"

#include <ostream>

#include "client/ReportingClient.h"

namespace tonewerk {

int Tool::fail(ExitStatus failure, std::string_view problem) const {
  out.flush();
  err << "twctl: " << problem << '\n';
  return failure;
}

Directories Tool::directories() const {
  return systemWide ? Directories::system() : Directories::fromEnvironment();
}

std::vector<std::string> Tool::socketPaths() const {
  if (!systemWide) return ReportingClient::socketPaths();
  return {Directories::system().runtime + "/reporting.sock"};
}

}  // namespace tonewerk
