// SPDX-License-Identifier: Apache-2.0
#include "platform/linux/otlp/LinuxLinkReport.h"

#include <algorithm>
#include <random>
#include <utility>
#include <vector>

#include "platform/Clock.h"
#include "platform/Log.h"
#include "platform/PreferenceStore.h"
#include "platform/linux/otlp/HttpClient.h"
#include "platform/linux/otlp/LinkReportBackends.h"
#include "platform/linux/store/ReportStore.h"
#include "platform/linux/system/HostIdentifier.h"

namespace tonewerk {
namespace {

constexpr const char* kServiceName = "com.orvane.tonewerk";

// Exporters stay until the end, even if the preference no longer names their endpoints.
constexpr std::size_t kMaxExporters = 2 * LinkReportBackends::kMaxEndpoints;

std::function<double()> systemJitter() {
  return [engine = std::mt19937(std::random_device()())]() mutable {
    return std::uniform_real_distribution<double>(0.0, 1.0)(engine);
  };
}

// The bytes of what is sent. Only a large payload is worth the copy without the hidden entry.
std::size_t bytesOf(const LinkReportSession::Payload& payload) {
  const std::size_t all = payload.entries.bytes();
  if (all <= LinuxLinkReport::kMaxPayloadBytes || payload.hidden.empty()) return all;
  ValueMap sent = payload.entries;
  sent.erase(payload.hidden);
  return sent.bytes();
}

}  // namespace

class LinuxLinkReport::Session final : public LinkReportSession {
 public:
  Session(LinuxLinkReport& service, const ValueMap& sessionInfo, const ValueMap& userInfo)
      : service_(service),
        sessionIdentifier_(sessionInfo.integer(kLinkReportSessionInfoSessionID)),
        urgency_(sessionInfo.boolean(kLinkReportSessionInfoBatchEvent) ? OtlpOutbox::Urgency::kBatched
                                                                       : OtlpOutbox::Urgency::kAtOnce),
        eventName_(userInfo.text(kLinkReportUserInfoServiceName)),
        stored_(std::make_shared<RtcSessionRecord>()) {
    stored_->sessionInfo = sessionInfo;
    stored_->userInfo = userInfo;
  }

  void startConfigurationWithCompletionHandler(CompletionHandler handler) override {
    const ValueMap preferences = service_.preferences_.readAll(kPreferenceDomain);
    const LinkReportBackends backends = service_.backendsOf(preferences);
    isLocal_ = backends.local;
    exporters_.clear();
    for (const auto& endpoint : backends.endpoints) {
      if (OtlpExporter* exporter = service_.exporterFor(endpoint.url)) exporters_.push_back(exporter);
    }
    repeatsEventName_ = preferences.boolean(kEventNameAttributeKey);
    if (isLocal_) {
      stored_->startedAt = service_.clock_.now();
      service_.store_.record(RtcSessionRow{stored_});
    }
    handler(backends.names());
  }

  [[nodiscard]] bool sendMessageWithCategory(std::uint16_t category, std::uint16_t type,
                                             const Payload& payload, std::string& problem) override {
    const std::size_t bytes = bytesOf(payload);
    if (bytes > kMaxPayloadBytes) {
      problem = "a payload of " + std::to_string(bytes) + " bytes is too large";
      return false;
    }
    const double now = service_.clock_.now();
    if (isLocal_)
      service_.store_.record(RtcMessageRow{now, stored_, category, type, payload.entries, payload.hidden});
    if (!exporters_.empty()) exportMessage(now, category, type, payload);
    return true;
  }

  void flushMessages() override {
    for (OtlpExporter* exporter : exporters_) exporter->flush();
  }

  bool isQuick() const override { return exporters_.empty(); }

  std::string description() const override { return eventName_ + " " + std::to_string(sessionIdentifier_); }

 private:
  void exportMessage(double now, std::uint16_t category, std::uint16_t type, const Payload& payload) {
    OtlpLogRecord record;
    record.time = now;
    record.identifier = service_.nextIdentifier(now);
    record.eventName = eventName_;
    record.sessionIdentifier = sessionIdentifier_;
    record.category = category;
    record.type = type;
    record.payload = payload.entries;
    if (!payload.hidden.empty()) record.payload.erase(payload.hidden);
    record.repeatsEventName = repeatsEventName_;
    // An exporter counts what it drops and logs the sum: a line for each message would be too many.
    for (OtlpExporter* exporter : exporters_) (void)exporter->add(record, urgency_);
  }

  LinuxLinkReport& service_;
  const std::int64_t sessionIdentifier_;
  const OtlpOutbox::Urgency urgency_;
  const std::string eventName_;
  const std::shared_ptr<RtcSessionRecord> stored_;
  bool isLocal_ = false;
  std::vector<OtlpExporter*> exporters_;  // owned by the service
  bool repeatsEventName_ = false;
};

LinuxLinkReport::LinuxLinkReport(ReportStore& store, const PreferenceStore& preferences, const Clock& clock,
                                 const LogCategory& log, std::string version, HttpClientMaker makeClient,
                                 const OtlpOutbox::Limits& limits)
    : store_(store),
      preferences_(preferences),
      clock_(clock),
      log_(log),
      ownResource_{kServiceName, std::move(version), hostIdentifier(), {}},
      makeClient_(std::move(makeClient)),
      limits_(limits) {}

LinuxLinkReport::~LinuxLinkReport() = default;

// A token begins with its parent's token. So it is the path from the root.
std::optional<std::string> LinuxLinkReport::newHierarchyTokenFromParentToken(
    const std::optional<std::string>& parentToken) {
  const std::string token = nextIdentifier(clock_.now());
  return parentToken ? *parentToken + "/" + token : token;
}

std::unique_ptr<LinkReportSession> LinuxLinkReport::initWithSessionInfo(
    const ValueMap& sessionInfo, const ValueMap& userInfo, const ValueArray* /*frameworksToCheck*/) {
  return std::make_unique<Session>(*this, sessionInfo, userInfo);
}

std::string LinuxLinkReport::nextIdentifier(double now) {
  const MutexLock lock(identifiersMutex_);
  return identifiers_.next(now);
}

LinkReportBackends LinuxLinkReport::backendsOf(const ValueMap& preferences) {
  const Value* configured = preferences.find(kBackendsKey);
  LinkReportBackends backends =
      LinkReportBackends::from(configured == nullptr ? std::nullopt : std::optional(*configured));
  std::string problems;
  for (const std::string& problem : backends.problems) problems += problem + "; ";
  const MutexLock lock(mutex_);
  if (!problems.empty() && problems != loggedProblems_) {
    errorLog(log_, "%@ of %@: %@left out", kBackendsKey, kPreferenceDomain, problems);
  }
  loggedProblems_ = std::move(problems);
  return backends;
}

OtlpExporter* LinuxLinkReport::exporterFor(const std::string& url) {
  const MutexLock lock(mutex_);
  const auto known = exporters_.find(url);
  if (known != exporters_.end()) return known->second.get();
  if (exporters_.size() >= kMaxExporters) {
    errorLog(log_, "no more than %zu addresses are sent to in one run; left out: %@", kMaxExporters, url);
    return nullptr;
  }
  auto exporter = std::make_unique<OtlpExporter>(
      url, makeClient_(), [this] { return resource(); },
      [this](const SendingRow& sending) { store_.record(sending); }, clock_, log_,
      RetryPolicy(systemJitter()), limits_);
  return exporters_.emplace(url, std::move(exporter)).first->second.get();
}

OtlpResource LinuxLinkReport::resource() const {
  OtlpResource resource = ownResource_;
  // Users opt in by giving the device a name.
  const std::optional<Value> device = preferences_.read(kPreferenceDomain, kDeviceIdentifierKey);
  if (device && device->asString() != nullptr) resource.deviceIdentifier = device->text();
  return resource;
}

SinkStatus LinuxLinkReport::status() {
  SinkStatus status{.name = "endpoints", .hangs = {}};
  for (const EndpointStatus& endpoint : endpoints()) {
    status.waiting += endpoint.waiting;
    status.dropped += endpoint.dropped;
    status.hangs = std::max(status.hangs, endpoint.hangs);
  }
  return status;
}

std::vector<EndpointStatus> LinuxLinkReport::endpoints() {
  std::vector<EndpointStatus> statuses;
  const MutexLock lock(mutex_);
  for (const auto& [url, exporter] : exporters_) {
    const auto still = std::chrono::floor<std::chrono::seconds>(exporter->stillSince());
    statuses.push_back({.url = url,
                        .waiting = exporter->waiting(),
                        .dropped = exporter->dropped(),
                        .hangs = still >= kHangTime ? still : std::chrono::seconds(0),
                        .problem = exporter->problem()});
  }
  return statuses;
}

bool LinuxLinkReport::finish(std::chrono::milliseconds timeout) {
  const auto deadline = std::chrono::steady_clock::now() + timeout;
  std::vector<OtlpExporter*> exporters;
  {
    const MutexLock lock(mutex_);
    for (const auto& [url, exporter] : exporters_) exporters.push_back(exporter.get());
  }
  for (OtlpExporter* exporter : exporters) exporter->beginEnd();
  bool isDone = true;
  for (OtlpExporter* exporter : exporters) isDone = exporter->waitForEnd(deadline) && isDone;
  return isDone;
}

}  // namespace tonewerk
