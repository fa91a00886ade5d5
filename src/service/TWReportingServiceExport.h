// SPDX-License-Identifier: Apache-2.0
#pragma once

#include <cstddef>
#include <memory>
#include <optional>

#include "protocol/RequestSet.h"
#include "service/TWReportingServiceProtocol.h"

namespace tonewerk {

// Turns a connection's requests, which name methods by place and bring values, into calls of the request set.
// Requests beyond it, those to see what the daemon does now, go to `watch`.
//
// A connection is a client or an onlooker, whichever it is first: an onlooker's requests that change
// something are refused, and so is a client's request to be an onlooker.
class TWReportingServiceExport final : public RequestHandler {
 public:
  TWReportingServiceExport(std::shared_ptr<TWReportingServiceProtocol> object,
                           std::unique_ptr<RequestHandler> watch);

  void handleRequest(std::size_t method, Arguments arguments, Reply reply, InFlightToken token) override;

  // What the daemon exports: names and parameters of its requests, those beyond the request set last.
  static const RequestSet& requestSet();

 private:
  enum class Role { kOpen, kClient, kOnlooker };

  // Takes the role that goes with the method; why it cannot, or none.
  std::optional<ReplyError> takeRole(std::size_t method);

  Role role_ = Role::kOpen;  // the messaging thread's
  const std::shared_ptr<TWReportingServiceProtocol> object_;
  const std::unique_ptr<RequestHandler> watch_;
};

}  // namespace tonewerk
