// SPDX-License-Identifier: Apache-2.0
#pragma once

#include <cstddef>
#include <memory>
#include <optional>

#include "platform/RequestHandler.h"
#include "service/TWReportingServiceProtocol.h"

namespace tonewerk {

class WatchRequests;

// Takes each request of one connection to its handler, which turns the request's values into a call of the
// request set or of `watch`.
//
// A connection becomes a client or an onlooker with its first request that decides it, and stays so. An
// onlooker's requests that change something are refused, and so is a client's request to be an onlooker.
class TWReportingServiceExport final : public RequestHandler {
 public:
  TWReportingServiceExport(std::shared_ptr<TWReportingServiceProtocol> object,
                           std::unique_ptr<WatchRequests> watch);
  ~TWReportingServiceExport() override;

  // `method`: the index in requests::all().
  void handleRequest(std::size_t method, Arguments arguments, Reply reply, InFlightToken token) override;

 private:
  enum class Role { kOpen, kClient, kOnlooker };

  // Gives the connection the role that the method needs. Returns an error when it already has the other role.
  [[nodiscard]] std::optional<ReplyError> takeRole(const Method& method);

  Role role_ = Role::kOpen;  // used on the messaging thread
  const std::shared_ptr<TWReportingServiceProtocol> object_;
  const std::unique_ptr<WatchRequests> watch_;
};

}  // namespace tonewerk
