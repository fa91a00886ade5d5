// SPDX-License-Identifier: Apache-2.0
#include <iostream>

#include "platform/linux/NlohmannJsonService.h"
#include "tools/twctl/Commands.h"

int main(int argc, char** argv) {
  const tonewerk::NlohmannJsonService json;
  tonewerk::Tool tool{std::cout, std::cerr, json};
  return tonewerk::runCommandLine(argc, argv, tool);
}
