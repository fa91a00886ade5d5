// SPDX-License-Identifier: Apache-2.0
#pragma once

#include <string>

#include "platform/Kolvi.h"
#include "platform/Runtrace.h"
#include "platform/linux/tracing/Tracing.h"

namespace tonewerk {

// A trace service for builds without tracing. Every start fails with the reason; the delegate is called
// before the start returns.
class UnavailableRuntrace final : public Runtrace {
 public:
  explicit UnavailableRuntrace(std::string reason) : reason_(std::move(reason)) {}
  [[nodiscard]] std::shared_ptr<RuntraceSession> makeSession(
      const RuntraceConfiguration& configuration) override;

 private:
  const std::string reason_;
};

// A trace-model library for builds without tracing. Opening a trace always fails.
class UnavailableKolvi final : public Kolvi {
 public:
  explicit UnavailableKolvi(std::string reason) : reason_(std::move(reason)) {}
  [[nodiscard]] std::unique_ptr<KolviModel> openModel(const std::string& traceLocation,
                                                      std::string& problem) override;

 private:
  const std::string reason_;
};

// Makes both.
Tracing makeUnavailableTracing(const std::string& reason);

}  // namespace tonewerk
