// SPDX-License-Identifier: Apache-2.0
#pragma once

#include <memory>

#include "platform/ExportedInterface.h"
#include "service/TWReportingServiceProtocol.h"

namespace tonewerk {

// Turns a connection's requests, which name methods by place and bring values, into calls of the request set.
class TWReportingServiceExport final : public ExportedObject {
 public:
  explicit TWReportingServiceExport(std::shared_ptr<TWReportingServiceProtocol> object);

  void handleRequest(std::size_t method, Arguments arguments, Reply reply, RequestToken token) override;

  // What the daemon exports: names and parameters of its requests.
  static const ExportedInterface& exportedInterface();

 private:
  const std::shared_ptr<TWReportingServiceProtocol> object_;
};

}  // namespace tonewerk
