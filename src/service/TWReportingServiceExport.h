// SPDX-License-Identifier: Apache-2.0
#pragma once

#include <memory>

#include "platform/ExportedInterface.h"
#include "service/TWReportingServiceProtocol.h"

namespace tonewerk {

// Turns a connection's requests, which name methods by place and bring values, into calls of the request set.
// Requests beyond it, those to see what the daemon does now, go to `watch`.
class TWReportingServiceExport final : public ExportedObject {
 public:
  TWReportingServiceExport(std::shared_ptr<TWReportingServiceProtocol> object,
                           std::unique_ptr<ExportedObject> watch);

  void handleRequest(std::size_t method, Arguments arguments, Reply reply, RequestToken token) override;

  // What the daemon exports: names and parameters of its requests, those beyond the request set last.
  static const ExportedInterface& exportedInterface();

 private:
  const std::shared_ptr<TWReportingServiceProtocol> object_;
  const std::unique_ptr<ExportedObject> watch_;
};

}  // namespace tonewerk
