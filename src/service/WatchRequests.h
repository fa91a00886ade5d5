// SPDX-License-Identifier: Apache-2.0
#pragma once

#include <cstdint>
#include <memory>

#include "platform/RequestHandler.h"

namespace tonewerk {

class Account;
class TapSubscriber;
class TWReportingServiceDelegateProtocol;

// Carries out one connection's requests to see what the daemon does: its sessions, and messages as they
// arrive. Each is called on the messaging thread, with arguments that were checked against
// protocol/Requests.h.
class WatchRequests {
 public:
  // The object holds `service` weakly. A request does nothing when the service is gone.
  WatchRequests(std::int32_t processIdentifier, std::shared_ptr<Account> account,
                std::weak_ptr<TWReportingServiceDelegateProtocol> service);

  void sessions(const Arguments& arguments, Reply reply, InFlightToken token);
  void openMessages(const Arguments& arguments, Reply reply, InFlightToken token);
  void nextMessages(Reply reply, InFlightToken token);
  void accounts(const Reply& reply) const;

 private:
  // Runs `body` with the service on the work queue. `body` must not refer to this object, which ends with the
  // connection.
  template <class Body>
  void onWorkQueue(Body body, Reply reply, InFlightToken token);

  const std::int32_t processIdentifier_;
  const std::shared_ptr<Account> account_;
  const std::weak_ptr<TWReportingServiceDelegateProtocol> service_;
  const std::shared_ptr<TapSubscriber> subscriber_;  // used on the work queue
};

}  // namespace tonewerk
