// SPDX-License-Identifier: Apache-2.0
#include "platform/linux/LinuxCapsa.h"

#include <utility>

namespace tonewerk {

class LinuxCapsa::Reporter final : public FaultsignReporter {
 public:
  FaultsignSignature signatureWithDomain(std::string domain, std::string type, std::string subType,
                                         std::string subtypeContext,
                                         std::optional<std::string> detectedProcess,
                                         std::optional<ValueMap> triggerThresholdValues) override {
    return {std::move(domain),          std::move(type),
            std::move(subType),         std::move(subtypeContext),
            std::move(detectedProcess), std::move(triggerThresholdValues)};
  }

  bool snapshotWithSignature(const FaultsignSignature& /*signature*/, double /*duration*/,
                             const std::optional<ValueMap>& /*event*/,
                             const std::optional<ValueMap>& /*payload*/, Reply reply) override {
    return refuse(reply);
  }

  bool startSessionWithSignature(const FaultsignSignature& /*signature*/, double /*duration*/,
                                 const std::optional<ValueMap>& /*events*/,
                                 const std::optional<ValueMap>& /*payload*/,
                                 const std::optional<ValueMap>& /*actions*/, Reply reply) override {
    return refuse(reply);
  }

  void cancelSession(const std::string& /*identifier*/) override {}

 private:
  static bool refuse(const Reply& reply) {
    reply(ValueMap{{kFaultsignReplySuccess, false},
                   {kFaultsignReplyReason, static_cast<std::int64_t>(kFaultsignErrorNotSupported)}});
    return true;
  }
};

std::unique_ptr<FaultsignReporter> LinuxCapsa::makeReporter() { return std::make_unique<Reporter>(); }

}  // namespace tonewerk
