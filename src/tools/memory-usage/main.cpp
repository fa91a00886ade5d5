// SPDX-License-Identifier: Apache-2.0
#include <iostream>

#include "tools/memory-usage/MemoryUsageCommand.h"

int main(int argc, char** argv) { return tonewerk::runMemoryUsage(argc, argv, std::cout, std::cerr); }
