// SPDX-License-Identifier: Apache-2.0
#pragma once

#include <cstdint>
#include <functional>
#include <memory>
#include <optional>
#include <string>

#include "values/Value.h"

namespace tonewerk {

// Keys of the service's reply and payload maps.
inline constexpr const char* kFaultsignReplySuccess = "kFaultsignReplySuccess";      // boolean
inline constexpr const char* kFaultsignReplySessionID = "kFaultsignReplySessionID";  // text
inline constexpr const char* kFaultsignReplyReason = "kFaultsignReplyReason";        // FaultsignError
inline constexpr const char* kFaultsignKeyPayloadDEParameters = "kFaultsignKeyPayloadDEParameters";

// Why the service refused, under kFaultsignReplyReason.
enum FaultsignError : std::int64_t {
  kFaultsignErrorNone = 0,
  kFaultsignErrorServiceNotReady,
  kFaultsignErrorNotSupported,
  kFaultsignErrorServiceUnavailable,
  kFaultsignErrorServiceInterrupted,
  kFaultsignErrorInvalidParameters,
  kFaultsignErrorDailyLimitExceeded,
  kFaultsignErrorRandomizedSuppression,
  kFaultsignErrorSessionNotFound,
  kFaultsignErrorRequestThrottled,
};

// What a capture is about.
struct FaultsignSignature {
  std::string domain;
  std::string type;
  std::string subType;
  std::string subtypeContext;
  std::optional<std::string> detectedProcess;
  std::optional<ValueMap> triggerThresholdValues;
};

// The diagnostic-capture service, as one symptom's reporter talks to it. On the thread that made it.
class FaultsignReporter {
 public:
  // The reply map, none when the service had nothing to say. At most once, on any thread: perhaps one of the
  // service's when the reporter is gone, perhaps the caller's before the call that it answers has returned.
  using Reply = std::function<void(const std::optional<ValueMap>&)>;

  virtual ~FaultsignReporter() = default;

  virtual FaultsignSignature signatureWithDomain(std::string domain, std::string type, std::string subType,
                                                 std::string subtypeContext,
                                                 std::optional<std::string> detectedProcess,
                                                 std::optional<ValueMap> triggerThresholdValues) = 0;

  // Captures now; `duration` in seconds. True when the parameters were accepted. The reply says whether a
  // capture was made of it; for parameters that were not accepted it may say why not.
  [[nodiscard]] virtual bool snapshotWithSignature(const FaultsignSignature& signature, double duration,
                                                   const std::optional<ValueMap>& event,
                                                   const std::optional<ValueMap>& payload, Reply reply) = 0;

  // Captures when `duration` (seconds) has passed, unless the session is cancelled before. True as above.
  [[nodiscard]] virtual bool startSessionWithSignature(const FaultsignSignature& signature, double duration,
                                                       const std::optional<ValueMap>& events,
                                                       const std::optional<ValueMap>& payload,
                                                       const std::optional<ValueMap>& actions,
                                                       Reply reply) = 0;

  // An unknown identifier is logged and does nothing.
  virtual void cancelSession(const std::string& identifier) = 0;
};

// Where reporters come from. Any thread.
class Capsa {
 public:
  virtual ~Capsa() = default;

  // It may outlive this one; it then refuses everything.
  [[nodiscard]] virtual std::unique_ptr<FaultsignReporter> makeReporter() = 0;
};

}  // namespace tonewerk
