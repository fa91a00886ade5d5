// SPDX-License-Identifier: Apache-2.0
#pragma once

#include <cstddef>
#include <memory>
#include <optional>

#include "platform/RequestHandler.h"
#include "service/TWReportingServiceProtocol.h"

namespace tonewerk {

class WatchRequests;

// One connection's requests: takes each to its handler, which turns the values that it brings into a call of
// the request set or of `watch`.
//
// A connection is a client or an onlooker, whichever it is first: an onlooker's requests that change
// something are refused, and so is a client's request to be an onlooker.
class TWReportingServiceExport final : public RequestHandler {
 public:
  TWReportingServiceExport(std::shared_ptr<TWReportingServiceProtocol> object,
                           std::unique_ptr<WatchRequests> watch);
  ~TWReportingServiceExport() override;

  // `method`: its place in requests::all().
  void handleRequest(std::size_t method, Arguments arguments, Reply reply, InFlightToken token) override;

 private:
  enum class Role { kOpen, kClient, kOnlooker };

  // Takes the role that goes with the method; why it cannot, or none.
  [[nodiscard]] std::optional<ReplyError> takeRole(const Method& method);

  Role role_ = Role::kOpen;  // the messaging thread's
  const std::shared_ptr<TWReportingServiceProtocol> object_;
  const std::unique_ptr<WatchRequests> watch_;
};

}  // namespace tonewerk
