// SPDX-License-Identifier: Apache-2.0
#include "tools/offline/OfflineServices.h"

#include <algorithm>
#include <cerrno>
#include <utility>

#include "platform/Clock.h"
#include "platform/PreferenceStore.h"
#include "platform/linux/store/ReportStore.h"

namespace tonewerk {
namespace {

class DroppedFile final : public NewFile {
 public:
  [[nodiscard]] std::error_code write(std::string_view /*text*/) override { return {}; }
  [[nodiscard]] std::error_code place(const std::string& /*name*/) override { return {}; }
};

class OfflineReporter final : public FaultsignReporter {
 public:
  explicit OfflineReporter(std::shared_ptr<std::uint64_t> captures) : captures_(std::move(captures)) {}

  [[nodiscard]] bool snapshotWithSignature(const FaultsignSignature& /*signature*/, double /*duration*/,
                                           const std::optional<ValueMap>& /*event*/,
                                           const std::optional<ValueMap>& /*payload*/, Reply reply) override {
    return accept(reply);
  }
  [[nodiscard]] bool startSessionWithSignature(const FaultsignSignature& /*signature*/, double /*duration*/,
                                               const std::optional<ValueMap>& /*events*/,
                                               const std::optional<ValueMap>& /*payload*/,
                                               const std::optional<ValueMap>& /*actions*/,
                                               Reply reply) override {
    return accept(reply);
  }
  void cancelSession(const std::string& /*identifier*/) override {}

 private:
  [[nodiscard]] bool accept(const Reply& reply) {
    reply(ValueMap{{kFaultsignReplySuccess, true}, {kFaultsignReplySessionID, std::to_string(++*captures_)}});
    return true;
  }

  const std::shared_ptr<std::uint64_t> captures_;
};

class RefusedTrace final : public RuntraceSession {
 public:
  void setDelegate(std::weak_ptr<RuntraceSessionDelegate> delegate) override {
    delegate_ = std::move(delegate);
  }
  void startRuntrace() override {
    if (const auto delegate = delegate_.lock())
      delegate->runtraceDidStart("a replay has no programs to trace");
  }
  void stopRuntrace() override {}
  bool isValid() const override { return false; }

 private:
  std::weak_ptr<RuntraceSessionDelegate> delegate_;
};

constexpr const char* kLocal = "local";

// The texts of the preference; without it the store alone.
LinkReportSession::Backends backendsOf(const PreferenceStore& preferences) {
  const std::optional<Value> preference = preferences.read("com.orvane.linkreport", "backends");
  std::vector<std::string> backends;
  if (!preference) backends.emplace_back(kLocal);
  if (preference && preference->asArray() != nullptr) {
    for (const Value& backend : *preference->asArray()) backends.push_back(backend.text());
  }
  return backends.empty() ? std::nullopt : std::optional(std::move(backends));
}

class OfflineLinkReportSession final : public LinkReportSession {
 public:
  OfflineLinkReportSession(ReportStore& store, const PreferenceStore& preferences, const Clock& clock,
                           const ValueMap& sessionInfo, const ValueMap& userInfo)
      : store_(store),
        preferences_(preferences),
        clock_(clock),
        stored_(std::make_shared<RtcSessionRecord>()) {
    stored_->sessionInfo = sessionInfo;
    stored_->userInfo = userInfo;
  }

  void startConfigurationWithCompletionHandler(CompletionHandler handler) override {
    const Backends backends = backendsOf(preferences_);
    isLocal_ = backends && std::find(backends->begin(), backends->end(), kLocal) != backends->end();
    if (isLocal_) {
      stored_->startedAt = clock_.now();
      store_.record(RtcSessionRow{stored_});
    }
    handler(backends);
  }
  [[nodiscard]] bool sendMessageWithCategory(std::uint16_t category, std::uint16_t type,
                                             const Payload& payload, std::string& /*problem*/) override {
    if (!isLocal_) return true;
    store_.record(RtcMessageRow{clock_.now(), stored_, category, type, payload.entries, payload.hidden});
    return true;
  }
  void flushMessages() override {}
  bool isQuick() const override { return true; }
  std::string description() const override { return "replay"; }

 private:
  ReportStore& store_;
  const PreferenceStore& preferences_;
  const Clock& clock_;
  const std::shared_ptr<RtcSessionRecord> stored_;
  bool isLocal_ = false;
};

}  // namespace

std::error_code OfflineFiles::createDirectories(const std::string& /*path*/, unsigned /*mode*/) { return {}; }

std::unique_ptr<NewFile> OfflineFiles::createFile(const std::string& /*directory*/,
                                                  const std::string& /*name*/, std::error_code& /*error*/) {
  return std::make_unique<DroppedFile>();
}

std::error_code OfflineFiles::readFile(const std::string& /*path*/, std::string& /*text*/) const {
  return std::make_error_code(std::errc::no_such_file_or_directory);
}

std::error_code OfflineFiles::moveFile(const std::string& /*from*/, const std::string& /*directory*/,
                                       const std::string& /*name*/) {
  return std::make_error_code(std::errc::no_such_file_or_directory);
}

std::error_code OfflineFiles::removeFile(const std::string& /*path*/) {
  return std::make_error_code(std::errc::no_such_file_or_directory);
}

std::unique_ptr<FaultsignReporter> OfflineCapsa::makeReporter() {
  return std::make_unique<OfflineReporter>(captures_);
}

void OfflineIssueDrafts::createDraft(TrackletDraft /*draft*/, std::optional<std::string> /*processName*/,
                                     std::string /*displayReason*/, CompletionHandler completionHandler) {
  completionHandler(std::nullopt);
}

std::shared_ptr<RuntraceSession> OfflineRuntrace::makeSession(
    const RuntraceConfiguration& /*configuration*/) {
  return std::make_shared<RefusedTrace>();
}

std::unique_ptr<KolviModel> OfflineKolvi::openModel(const std::string& /*traceLocation*/,
                                                    std::string& problem) {
  problem = "a replay has no traces";
  return nullptr;
}

std::unique_ptr<BenchfileWriter> OfflineBenchfile::open(const std::string& /*path*/,
                                                        const BenchfileFacts& /*facts*/, int& systemError) {
  systemError = ENOENT;
  return nullptr;
}

CommandRunner::Result OfflineCommands::run(const std::string& /*command*/, const Limits& /*limits*/) {
  return {{}, End::kNotStarted, 0};
}

std::error_code OfflineThreads::start(std::string_view /*name*/, Task work) {
  work();
  return {};
}

std::optional<std::string> OfflineLinkReport::newHierarchyTokenFromParentToken(
    const std::optional<std::string>& parentToken) {
  const std::string token = std::to_string(++tokens_);
  return parentToken ? *parentToken + "/" + token : token;
}

std::unique_ptr<LinkReportSession> OfflineLinkReport::initWithSessionInfo(
    const ValueMap& sessionInfo, const ValueMap& userInfo, const ValueArray* /*frameworksToCheck*/) {
  return std::make_unique<OfflineLinkReportSession>(store_, preferences_, clock_, sessionInfo, userInfo);
}

}  // namespace tonewerk
