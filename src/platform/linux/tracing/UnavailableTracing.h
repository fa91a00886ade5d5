// SPDX-License-Identifier: Apache-2.0
#pragma once

#include <string>

#include "platform/Kolvi.h"
#include "platform/Runtrace.h"
#include "platform/linux/tracing/Tracing.h"

namespace tonewerk {

// The trace service where there is none: every start fails with the reason, from inside the call.
class UnavailableRuntrace final : public Runtrace {
 public:
  explicit UnavailableRuntrace(std::string reason) : reason_(std::move(reason)) {}
  [[nodiscard]] std::shared_ptr<RuntraceSession> makeSession(
      const RuntraceConfiguration& configuration) override;

 private:
  const std::string reason_;
};

// The trace-model library where there is none: no trace opens.
class UnavailableKolvi final : public Kolvi {
 public:
  explicit UnavailableKolvi(std::string reason) : reason_(std::move(reason)) {}
  [[nodiscard]] std::unique_ptr<KolviModel> openModel(const std::string& traceLocation,
                                                      std::string& problem) override;

 private:
  const std::string reason_;
};

// Both.
Tracing makeUnavailableTracing(const std::string& reason);

}  // namespace tonewerk
