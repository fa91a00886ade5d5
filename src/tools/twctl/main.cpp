// SPDX-License-Identifier: Apache-2.0
#include <csignal>
#include <iostream>
#include <unistd.h>

#include "platform/linux/json/NlohmannJsonService.h"
#include "tools/twctl/commands/Commands.h"

int main(int argc, char** argv) {
  std::signal(SIGXFSZ, SIG_IGN);  // writing past the file size limit then fails instead of ending the process
  const tonewerk::NlohmannJsonService json;
  tonewerk::Tool tool{std::cout, std::cerr, json};
  tool.outIsTerminal = isatty(STDOUT_FILENO) != 0;
  tool.outDescriptor = STDOUT_FILENO;
  tool.in = &std::cin;
  if (isatty(STDIN_FILENO) != 0) tool.inDescriptor = STDIN_FILENO;
  return tonewerk::runCommandLine(argc, argv, tool);
}
