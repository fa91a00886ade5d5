// SPDX-License-Identifier: Apache-2.0
#include "platform/Log.h"

namespace tonewerk {

std::string_view textOf(LogLevel level) {
  switch (level) {
    case LogLevel::kDebug:
      return "debug";
    case LogLevel::kInfo:
      return "info";
    case LogLevel::kDefault:
      return "default";
    case LogLevel::kError:
      return "error";
  }
  return "default";
}

}  // namespace tonewerk
