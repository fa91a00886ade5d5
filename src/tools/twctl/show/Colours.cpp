// SPDX-License-Identifier: Apache-2.0
#include "tools/twctl/show/Colours.h"

#include <cstdlib>
#include <string_view>

#include "tools/twctl/Tool.h"

namespace tonewerk::colours {
namespace {

std::string_view variable(const char* name) {
  const char* value = std::getenv(name);
  return value == nullptr ? "" : value;
}

}  // namespace

bool areWanted(const Tool& tool) {
  return tool.outIsTerminal && !tool.asJson && variable("NO_COLOR").empty() && variable("TERM") != "dumb";
}

}  // namespace tonewerk::colours
