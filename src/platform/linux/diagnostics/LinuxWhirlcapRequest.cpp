// SPDX-License-Identifier: Apache-2.0
#include "platform/linux/diagnostics/LinuxWhirlcapRequest.h"

#include <utility>

#include "platform/Log.h"
#include "platform/linux/diagnostics/DiagnosticsStore.h"

namespace tonewerk {

void LinuxWhirlcapRequest::request(std::string requester, std::string reason, std::string description,
                                   ValueMap payload, Flags flags) {
  DiagnosticItem item{DiagnosticKind::kWhirlcap};
  item.request = {{"requester", requester},
                  {"reason", reason},
                  {"description", description},
                  {"payload", std::move(payload)},
                  {"flags", ValueArray{flags.first, flags.second}}};
  const std::error_code error = store_.add(std::move(item), {});
  // The store logs once that it is full. A line for each request would be too many, since every overload
  // makes one.
  if (!error || error == std::errc::no_buffer_space) return;
  errorLog(log_, "stall trace not collected. requester=%@ reason=%@: %@", requester, reason, error.message());
}

}  // namespace tonewerk
