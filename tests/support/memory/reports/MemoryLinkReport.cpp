// SPDX-License-Identifier: Apache-2.0
#include "support/memory/reports/MemoryLinkReport.h"

#include <utility>

#include "values/Mutex.h"

namespace tonewerk {

struct MemoryLinkReport::State {
  Mutex mutex;
  std::vector<std::shared_ptr<Session>> sessions GUARDED_BY(mutex);
  bool answersAtOnce GUARDED_BY(mutex) = true;
  LinkReportSession::Backends backends GUARDED_BY(mutex) = std::vector<std::string>{"memory"};
  bool givesTokens GUARDED_BY(mutex) = true;
  bool isQuick GUARDED_BY(mutex) = true;
  std::size_t tokenCount GUARDED_BY(mutex) = 0;
  std::optional<std::string> problem GUARDED_BY(mutex);
};

class MemoryLinkReport::MemorySession final : public LinkReportSession {
 public:
  MemorySession(std::shared_ptr<State> state, std::shared_ptr<Session> session)
      : state_(std::move(state)), session_(std::move(session)) {}
  MemorySession(const MemorySession&) = delete;
  MemorySession& operator=(const MemorySession&) = delete;
  ~MemorySession() override {
    const MutexLock lock(state_->mutex);
    session_->isOpen = false;
  }

  void startConfigurationWithCompletionHandler(CompletionHandler handler) override {
    Backends backends;
    {
      const MutexLock lock(state_->mutex);
      session_->handler = handler;
      if (!state_->answersAtOnce) return;
      backends = state_->backends;
    }
    handler(std::move(backends));
  }

  [[nodiscard]] bool sendMessageWithCategory(std::uint16_t category, std::uint16_t type,
                                             const Payload& payload, std::string& problem) override {
    const MutexLock lock(state_->mutex);
    if (state_->problem) {
      problem = *state_->problem;
      return false;
    }
    ValueMap sent = payload.entries;
    if (!payload.hidden.empty()) sent.erase(payload.hidden);
    session_->messages.push_back({category, type, std::move(sent)});
    return true;
  }

  void flushMessages() override {
    const MutexLock lock(state_->mutex);
    ++session_->flushCount;
  }

  bool isQuick() const override {
    const MutexLock lock(state_->mutex);
    return state_->isQuick;
  }

  std::string description() const override { return "MemorySession"; }

 private:
  const std::shared_ptr<State> state_;
  const std::shared_ptr<Session> session_;
};

MemoryLinkReport::MemoryLinkReport() : state_(std::make_shared<State>()) {}
MemoryLinkReport::~MemoryLinkReport() = default;

std::optional<std::string> MemoryLinkReport::newHierarchyTokenFromParentToken(
    const std::optional<std::string>& parentToken) {
  const MutexLock lock(state_->mutex);
  if (!state_->givesTokens) return std::nullopt;
  return parentToken.value_or("root") + "/" + std::to_string(++state_->tokenCount);
}

std::unique_ptr<LinkReportSession> MemoryLinkReport::initWithSessionInfo(
    const ValueMap& sessionInfo, const ValueMap& userInfo, const ValueArray* /*frameworksToCheck*/) {
  auto session = std::make_shared<Session>();
  session->sessionInfo = sessionInfo;
  session->userInfo = userInfo;
  const MutexLock lock(state_->mutex);
  state_->sessions.push_back(session);
  return std::make_unique<MemorySession>(state_, std::move(session));
}

void MemoryLinkReport::setQuick(bool isQuick) {
  const MutexLock lock(state_->mutex);
  state_->isQuick = isQuick;
}

void MemoryLinkReport::answerAtOnce(LinkReportSession::Backends backends) {
  const MutexLock lock(state_->mutex);
  state_->answersAtOnce = true;
  state_->backends = std::move(backends);
}

void MemoryLinkReport::answerLater() {
  const MutexLock lock(state_->mutex);
  state_->answersAtOnce = false;
}

void MemoryLinkReport::answer(std::size_t at, LinkReportSession::Backends backends) {
  session(at).handler(std::move(backends));
}

void MemoryLinkReport::giveNoTokens() {
  const MutexLock lock(state_->mutex);
  state_->givesTokens = false;
}

void MemoryLinkReport::failSending(std::string problem) {
  const MutexLock lock(state_->mutex);
  state_->problem = std::move(problem);
}

std::size_t MemoryLinkReport::count() const {
  const MutexLock lock(state_->mutex);
  return state_->sessions.size();
}

MemoryLinkReport::Session MemoryLinkReport::session(std::size_t at) const {
  const MutexLock lock(state_->mutex);
  return *state_->sessions.at(at);
}

}  // namespace tonewerk
