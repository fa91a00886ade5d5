// SPDX-License-Identifier: Apache-2.0
#include "platform/linux/LinuxWhirlcapRequest.h"

#include "platform/LogLine.h"

namespace tonewerk {

void LinuxWhirlcapRequest::request(std::string requester, std::string reason, std::string /*description*/,
                                   ValueMap /*payload*/, Flags /*flags*/) {
  errorLog(log_, "stall traces are not collected. requester=%@ reason=%@", requester, reason);
}

}  // namespace tonewerk
