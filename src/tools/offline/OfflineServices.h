// SPDX-License-Identifier: Apache-2.0
#pragma once

#include <cstdint>
#include <map>
#include <memory>
#include <optional>
#include <string>
#include <string_view>
#include <vector>

#include "platform/Benchfile.h"
#include "platform/CommandRunner.h"
#include "platform/DetachedThreads.h"
#include "platform/FaultsignReporter.h"
#include "platform/FileSystem.h"
#include "platform/IssueDraftService.h"
#include "platform/Kolvi.h"
#include "platform/LinkReport.h"
#include "platform/Log.h"
#include "platform/Runtrace.h"
#include "platform/TracePoints.h"
#include "platform/WhirlcapRequest.h"

namespace tonewerk {

class Clock;
class PreferenceStore;
class ReportStore;

// The services of a replay, which may change nothing but its store: they accept what the daemon gives them
// and drop it, so that the daemon goes on as it did on the device. All are used on the replay's one thread.

class OfflineLog final : public Log {
 public:
  bool isEnabled(std::string_view /*category*/, LogLevel /*level*/) const override { return false; }
  void write(std::string_view /*subsystem*/, std::string_view /*category*/, LogLevel /*level*/,
             std::string_view /*message*/) override {}
};

class OfflineTracePoints final : public TracePoints {
 public:
  void emit(std::uint32_t /*code*/) override {}
  void beginInterval(const char* /*name*/, std::int64_t /*identifier*/) override {}
  void endInterval(const char* /*name*/, std::int64_t /*identifier*/) override {}
};

// Summaries as JSON files, and whatever else becomes a file beside the store, are not made.
class OfflineFiles final : public FileSystem {
 public:
  [[nodiscard]] std::error_code createDirectories(const std::string& path, unsigned mode) override;
  [[nodiscard]] std::unique_ptr<NewFile> createFile(const std::string& directory, const std::string& name,
                                                    std::error_code& error) override;
  bool exists(const std::string& /*path*/) const override { return false; }
  [[nodiscard]] std::error_code readFile(const std::string& path, std::string& text) const override;
  [[nodiscard]] std::error_code moveFile(const std::string& from, const std::string& directory,
                                         const std::string& name) override;
  [[nodiscard]] std::vector<FileEntry> listFiles(const std::string& /*directory*/,
                                                 std::error_code& /*error*/) const override {
    return {};
  }
  [[nodiscard]] std::error_code removeFile(const std::string& path) override;
  void removeLeftovers(const std::string& /*directory*/) override {}
};

// Accepts every capture, and numbers them.
class OfflineCapsa final : public Capsa {
 public:
  [[nodiscard]] std::unique_ptr<FaultsignReporter> makeReporter() override;

 private:
  const std::shared_ptr<std::uint64_t> captures_ = std::make_shared<std::uint64_t>(0);
};

class OfflineIssueDrafts final : public IssueDraftService {
 public:
  void createDraft(TrackletDraft draft, std::optional<std::string> processName, std::string displayReason,
                   CompletionHandler completionHandler) override;
};

class OfflineWhirlcaps final : public WhirlcapRequest {
 public:
  void request(std::string /*requester*/, std::string /*reason*/, std::string /*description*/,
               ValueMap /*payload*/, Flags /*flags*/) override {}
};

// No program can be traced.
class OfflineRuntrace final : public Runtrace {
 public:
  [[nodiscard]] std::shared_ptr<RuntraceSession> makeSession(
      const RuntraceConfiguration& configuration) override;
};

class OfflineKolvi final : public Kolvi {
 public:
  [[nodiscard]] std::unique_ptr<KolviModel> openModel(const std::string& traceLocation,
                                                      std::string& problem) override;
};

class OfflineBenchfile final : public Benchfile {
 public:
  [[nodiscard]] std::unique_ptr<BenchfileWriter> open(const std::string& path, const BenchfileFacts& facts,
                                                      int& systemError) override;
};

// No command is found.
class OfflineCommands final : public CommandRunner {
 public:
  [[nodiscard]] Result run(const std::string& command, const Limits& limits) override;
};

// Runs the work at once.
class OfflineThreads final : public DetachedThreads {
 public:
  [[nodiscard]] std::error_code start(std::string_view name, Task work) override;
};

// Reports real-time communication to the store, if the preference "backends" allows that. Other backends are
// endpoints, which get nothing. Sessions get numbers in place of random tokens.
class OfflineLinkReport final : public LinkReport {
 public:
  // All outlive it.
  OfflineLinkReport(ReportStore& store, const PreferenceStore& preferences, const Clock& clock)
      : store_(store), preferences_(preferences), clock_(clock) {}

  [[nodiscard]] std::optional<std::string> newHierarchyTokenFromParentToken(
      const std::optional<std::string>& parentToken) override;
  [[nodiscard]] std::unique_ptr<LinkReportSession> initWithSessionInfo(
      const ValueMap& sessionInfo, const ValueMap& userInfo, const ValueArray* frameworksToCheck) override;

 private:
  ReportStore& store_;
  const PreferenceStore& preferences_;
  const Clock& clock_;
  std::uint64_t tokens_ = 0;
};

}  // namespace tonewerk
