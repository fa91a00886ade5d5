// SPDX-License-Identifier: Apache-2.0
#include "platform/SessionBook.h"

namespace tonewerk {

std::string_view textOf(SessionEnding ending) {
  switch (ending) {
    case SessionEnding::kStopped:
      return "stopped";
    case SessionEnding::kReplaced:
      return "replaced";
    case SessionEnding::kDisconnected:
      return "disconnected";
    case SessionEnding::kInterrupted:
      break;
  }
  return "interrupted";
}

}  // namespace tonewerk
