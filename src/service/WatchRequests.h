// SPDX-License-Identifier: Apache-2.0
#pragma once

#include <cstdint>
#include <memory>

#include "platform/RequestHandler.h"

namespace tonewerk {

class TapSubscriber;
class TWReportingServiceDelegateProtocol;

// One connection's requests to see what the daemon does now: its sessions, and messages as they arrive. Each
// takes the request's arguments, which suit its description in protocol/Requests.h, on the messaging thread.
class WatchRequests {
 public:
  // `service` is held weakly; a request that finds it gone does nothing.
  WatchRequests(std::int32_t processIdentifier, std::weak_ptr<TWReportingServiceDelegateProtocol> service);

  void sessions(const Arguments& arguments, Reply reply, InFlightToken token);
  void openMessages(const Arguments& arguments, Reply reply, InFlightToken token);
  void nextMessages(Reply reply, InFlightToken token);

 private:
  // Runs `body` with the service on the work queue. What it needs of this object it holds itself, since this
  // object goes with the connection.
  template <class Body>
  void onWorkQueue(Body body, Reply reply, InFlightToken token);

  const std::int32_t processIdentifier_;
  const std::weak_ptr<TWReportingServiceDelegateProtocol> service_;
  const std::shared_ptr<TapSubscriber> subscriber_;  // the work queue's
};

}  // namespace tonewerk
