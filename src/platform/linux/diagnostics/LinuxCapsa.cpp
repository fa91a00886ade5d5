// SPDX-License-Identifier: Apache-2.0
#include "platform/linux/diagnostics/LinuxCapsa.h"

#include <algorithm>
#include <cstdint>
#include <string>
#include <system_error>
#include <utility>
#include <vector>

#include "platform/Log.h"
#include "platform/PreferenceStore.h"
#include "platform/SerialQueue.h"
#include "platform/linux/diagnostics/CaptureSessions.h"
#include "platform/linux/diagnostics/DiagnosticsStore.h"

namespace tonewerk {
namespace {

constexpr double kSecondsADay = 86'400.0;
constexpr std::size_t kDateDigits = 10;  // of "2026-11-20T00:00:00Z"
constexpr const char* kDayKey = "day";
constexpr const char* kCountKey = "count";

std::string textOfDay(std::int64_t day) {
  return textOf(Date{static_cast<double>(day) * kSecondsADay}).substr(0, kDateDigits);
}

// Returns a count of 0 if the stored one is that of another day.
CapturePolicy::Count readCount(const PreferenceStore& preferences, std::int64_t today) {
  const std::optional<Value> stored =
      preferences.read(LinuxCapsa::kPreferenceDomain, LinuxCapsa::kAcceptedKey);
  const ValueMap* table = stored ? stored->asMap() : nullptr;
  if (table == nullptr || table->text(kDayKey) != textOfDay(today)) return {today, 0};
  return {today, std::max<std::int64_t>(table->integer(kCountKey), 0)};
}

ValueMap requestOf(const CaptureRequest& capture) {
  ValueMap signature{{"domain", capture.signature.domain},
                     {"type", capture.signature.type},
                     {"subType", capture.signature.subType},
                     {"subtypeContext", capture.signature.subtypeContext}};
  if (capture.signature.detectedProcess) signature.set("detectedProcess", *capture.signature.detectedProcess);
  ValueMap request{{"signature", std::move(signature)}, {"duration", capture.duration}};
  if (capture.payload) request.set("payload", *capture.payload);
  return request;
}

ValueMap replyOf(const CaptureSessions::Outcome& outcome) {
  if (outcome.error == kFaultsignErrorNone) {
    return {{kFaultsignReplySuccess, true}, {kFaultsignReplySessionID, outcome.identifier}};
  }
  return {{kFaultsignReplySuccess, false}, {kFaultsignReplyReason, static_cast<std::int64_t>(outcome.error)}};
}

}  // namespace

// The state that reporters share. A running call of a reporter may keep it a little longer than LinuxCapsa.
struct LinuxCapsa::Service {
  std::shared_ptr<CaptureSessions> sessions;
  PreferenceStore& preferences;
  const LogCategory& log;
  std::unique_ptr<SerialQueue> queue;  // writes the count, so that the work queue does not wait for the disk

  void keepCount() {
    queue->async([held = sessions, &store = preferences, &category = log] {
      const CapturePolicy::Count count = held->count();
      std::string problem;
      const std::error_code error =
          store.write(kPreferenceDomain, kAcceptedKey,
                      ValueMap{{kDayKey, textOfDay(count.day)}, {kCountKey, count.accepted}}, &problem);
      if (error) errorLog(category, "cannot keep how many captures the day has seen: %@", problem);
    });
  }
};

class LinuxCapsa::Reporter final : public FaultsignReporter {
 public:
  explicit Reporter(std::weak_ptr<Service> service) : service_(std::move(service)) {}

  [[nodiscard]] bool snapshotWithSignature(const FaultsignSignature& signature, double duration,
                                           const std::optional<ValueMap>& /*event*/,
                                           const std::optional<ValueMap>& payload, Reply reply) override {
    return answer(ask(&CaptureSessions::snapshot, {signature, duration, payload}), reply);
  }

  [[nodiscard]] bool startSessionWithSignature(const FaultsignSignature& signature, double duration,
                                               const std::optional<ValueMap>& /*events*/,
                                               const std::optional<ValueMap>& payload,
                                               const std::optional<ValueMap>& /*actions*/,
                                               Reply reply) override {
    return answer(ask(&CaptureSessions::start, {signature, duration, payload}), reply);
  }

  void cancelSession(const std::string& identifier) override {
    const auto service = service_.lock();
    if (service == nullptr) return;
    if (service->sessions->cancel(identifier)) {
      infoLog(service->log, "capture cancelled. sessionId=%@", identifier);
    } else {  // not an error: the capture may have been made already
      infoLog(service->log, "no capture to cancel: kFaultsignErrorSessionNotFound. sessionId=%@", identifier);
    }
  }

 private:
  using Operation = CaptureSessions::Outcome (CaptureSessions::*)(const CaptureRequest&);

  [[nodiscard]] CaptureSessions::Outcome ask(Operation operation, const CaptureRequest& request) {
    const auto service = service_.lock();
    if (service == nullptr) return {kFaultsignErrorServiceUnavailable};
    CaptureSessions::Outcome outcome = ((*service->sessions).*operation)(request);
    if (outcome.error == kFaultsignErrorNone) service->keepCount();
    return outcome;
  }

  static bool answer(const CaptureSessions::Outcome& outcome, const Reply& reply) {
    if (reply) reply(replyOf(outcome));
    return outcome.error != kFaultsignErrorInvalidParameters;
  }

  const std::weak_ptr<Service> service_;
};

LinuxCapsa::LinuxCapsa(DiagnosticsStore& store, PreferenceStore& preferences, SerialQueueFactory& queues,
                       TimerService& timers, const Clock& clock, const LogCategory& log)
    : service_(std::make_shared<Service>(
          Service{std::make_shared<CaptureSessions>(
                      clock, timers, readCount(preferences, CapturePolicy::dayOf(clock)),
                      [&store, &log](const std::string& identifier, const CaptureRequest& request) {
                        DiagnosticItem item{DiagnosticKind::kCapture, identifier, requestOf(request)};
                        const std::error_code error = store.add(std::move(item), {});
                        if (error)
                          errorLog(log, "capture not made. sessionId=%@: %@", identifier, error.message());
                        return !error;
                      }),
                  preferences, log,
                  queues.makeSerialQueue("com.orvane.tonewerk.captures", QueuePriority::kUtility)})) {}

LinuxCapsa::~LinuxCapsa() { finish(); }

std::unique_ptr<FaultsignReporter> LinuxCapsa::makeReporter() { return std::make_unique<Reporter>(service_); }

void LinuxCapsa::finish() {
  const std::vector<std::string> dropped = service_->sessions->finish();
  if (!dropped.empty()) {
    defaultLog(service_->log, "captures dropped that were still pending: %@", dropped);
  }
  service_->queue->drain();
}

}  // namespace tonewerk
