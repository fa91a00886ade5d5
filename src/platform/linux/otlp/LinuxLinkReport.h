// SPDX-License-Identifier: Apache-2.0
#pragma once

#include <chrono>
#include <functional>
#include <map>
#include <memory>
#include <optional>
#include <string>
#include <string_view>
#include <vector>

#include "platform/DaemonStatus.h"
#include "platform/LinkReport.h"
#include "platform/SinkStatus.h"
#include "platform/linux/files/Ulid.h"
#include "platform/linux/otlp/OtlpExporter.h"
#include "values/Mutex.h"

namespace tonewerk {

class Clock;
class HttpClient;
class LogCategory;
class PreferenceStore;
class ReportStore;
struct LinkReportBackends;

// Implements the real-time-communication reporting service with the report store and OTLP/HTTP endpoints. The
// preferences of the domain "com.orvane.linkreport" choose between them; docs/rtc.md describes the
// preferences and what is sent.
//
// startConfigurationWithCompletionHandler() calls its handler at once. An exporter is created when a session
// first uses an endpoint, and lives as long as the service. Any thread.
class LinuxLinkReport final : public LinkReport {
 public:
  static constexpr std::string_view kPreferenceDomain = "com.orvane.linkreport";
  static constexpr std::string_view kBackendsKey = "backends";
  static constexpr std::string_view kDeviceIdentifierKey = "device_id";
  static constexpr std::string_view kEventNameAttributeKey = "event_name_attribute";
  // Larger payloads are refused. Only a summary can be so large.
  static constexpr std::size_t kMaxPayloadBytes = std::size_t{32} << 20;
  // Longer than a batch waits for its time.
  static constexpr std::chrono::seconds kHangTime{15};

  using HttpClientMaker = std::function<std::unique_ptr<HttpClient>()>;

  // `version` is the daemon's. All arguments that are references must outlive the service.
  LinuxLinkReport(ReportStore& store, const PreferenceStore& preferences, const Clock& clock,
                  const LogCategory& log, std::string version, HttpClientMaker makeClient,
                  const OtlpOutbox::Limits& limits = {});
  LinuxLinkReport(const LinuxLinkReport&) = delete;
  LinuxLinkReport& operator=(const LinuxLinkReport&) = delete;
  ~LinuxLinkReport() override;

  [[nodiscard]] std::optional<std::string> newHierarchyTokenFromParentToken(
      const std::optional<std::string>& parentToken) override;
  [[nodiscard]] std::unique_ptr<LinkReportSession> initWithSessionInfo(
      const ValueMap& sessionInfo, const ValueMap& userInfo, const ValueArray* frameworksToCheck) override;

  // Any thread. Counts the records for all endpoints. Endpoints hang when one of them has taken no record for
  // kHangTime.
  SinkStatus status();
  // Any thread. Of each endpoint by itself, in the order of their addresses.
  std::vector<EndpointStatus> endpoints();

  // Sends all waiting records within `timeout`. Nothing is sent after that. False if records are left.
  [[nodiscard]] bool finish(std::chrono::milliseconds timeout);

 private:
  class Session;

  std::string nextIdentifier(double now);
  // The backends that the domain's `preferences` name. Logs new problems.
  LinkReportBackends backendsOf(const ValueMap& preferences);
  // Null if there are already kMaxExporters exporters.
  [[nodiscard]] OtlpExporter* exporterFor(const std::string& url);
  OtlpResource resource() const;

  ReportStore& store_;
  const PreferenceStore& preferences_;
  const Clock& clock_;
  const LogCategory& log_;
  const OtlpResource ownResource_;
  const HttpClientMaker makeClient_;
  const OtlpOutbox::Limits limits_;

  Mutex identifiersMutex_;  // never held for long
  UlidGenerator identifiers_ GUARDED_BY(identifiersMutex_);
  Mutex mutex_;
  std::string loggedProblems_ GUARDED_BY(mutex_);
  // By URL. None is removed before the service ends.
  std::map<std::string, std::unique_ptr<OtlpExporter>> exporters_ GUARDED_BY(mutex_);
};

}  // namespace tonewerk
