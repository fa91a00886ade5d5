// SPDX-License-Identifier: Apache-2.0
#pragma once

#include <cstdint>
#include <functional>
#include <memory>
#include <optional>
#include <string>
#include <utility>

#include "values/Value.h"

namespace tonewerk {

// Keys of the service's reply and payload maps.
inline constexpr const char* kFaultsignReplySuccess = "kFaultsignReplySuccess";      // boolean
inline constexpr const char* kFaultsignReplySessionID = "kFaultsignReplySessionID";  // text
inline constexpr const char* kFaultsignReplyReason = "kFaultsignReplyReason";        // FaultsignError
inline constexpr const char* kFaultsignKeyPayloadDEParameters = "kFaultsignKeyPayloadDEParameters";

// Why the service refused; the value of kFaultsignReplyReason.
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

// Describes the problem that a capture is about.
struct FaultsignSignature {
  std::string domain;
  std::string type;
  std::string subType;
  std::string subtypeContext;
  std::optional<std::string> detectedProcess;
  std::optional<ValueMap> triggerThresholdValues;
};

// Asks the diagnostic-capture service for captures, for one kind of symptom. Use it on the thread that made
// it.
class FaultsignReporter {
 public:
  // Takes the reply map, or none when the service sent none. Called at most once, on any thread: possibly on
  // a thread of the service after the reporter is gone, or on the caller's thread before the call that it
  // answers has returned.
  using Reply = std::function<void(const std::optional<ValueMap>&)>;

  virtual ~FaultsignReporter() = default;

  // A signature of these, unless a service makes its own.
  virtual FaultsignSignature signatureWithDomain(std::string domain, std::string type, std::string subType,
                                                 std::string subtypeContext,
                                                 std::optional<std::string> detectedProcess,
                                                 std::optional<ValueMap> triggerThresholdValues) {
    return {std::move(domain),          std::move(type),
            std::move(subType),         std::move(subtypeContext),
            std::move(detectedProcess), std::move(triggerThresholdValues)};
  }

  // Captures now. `duration` is in seconds. Returns true when the parameters were accepted; the reply then
  // says whether a capture was made. For refused parameters the reply may give the reason.
  [[nodiscard]] virtual bool snapshotWithSignature(const FaultsignSignature& signature, double duration,
                                                   const std::optional<ValueMap>& event,
                                                   const std::optional<ValueMap>& payload, Reply reply) = 0;

  // Captures after `duration` (in seconds), unless the session is cancelled before. The result and the reply
  // are as above.
  [[nodiscard]] virtual bool startSessionWithSignature(const FaultsignSignature& signature, double duration,
                                                       const std::optional<ValueMap>& events,
                                                       const std::optional<ValueMap>& payload,
                                                       const std::optional<ValueMap>& actions,
                                                       Reply reply) = 0;

  // Does nothing but log an unknown identifier.
  virtual void cancelSession(const std::string& identifier) = 0;
};

// Makes reporters. Any thread.
class Capsa {
 public:
  virtual ~Capsa() = default;

  // The reporter may outlive this object; it then refuses everything.
  [[nodiscard]] virtual std::unique_ptr<FaultsignReporter> makeReporter() = 0;
};

}  // namespace tonewerk
