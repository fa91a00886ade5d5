// SPDX-License-Identifier: Apache-2.0
#pragma once

#include <cstddef>
#include <cstdint>
#include <memory>
#include <vector>

#include "protocol/RequestSet.h"

namespace tonewerk {

class TapSubscriber;
class TWReportingServiceDelegateProtocol;

// One connection's requests to see what the daemon does now: its sessions, and messages as they arrive.
class WatchExport final : public RequestHandler {
 public:
  // `service` is held weakly; a request that finds it gone does nothing.
  WatchExport(std::int32_t processIdentifier, std::weak_ptr<TWReportingServiceDelegateProtocol> service);
  WatchExport(const WatchExport&) = delete;
  WatchExport& operator=(const WatchExport&) = delete;
  ~WatchExport() override;

  void handleRequest(std::size_t method, Arguments arguments, Reply reply, InFlightToken token) override;

  // Names and parameters of its requests, all for the owner alone.
  static const std::vector<Method>& methods();

 private:
  const std::int32_t processIdentifier_;
  const std::weak_ptr<TWReportingServiceDelegateProtocol> service_;
  const std::shared_ptr<TapSubscriber> watcher_;  // the work queue's
};

}  // namespace tonewerk
