// SPDX-License-Identifier: Apache-2.0
#include "support/memory/reports/MemoryCapsa.h"

#include <utility>

#include "values/Mutex.h"

namespace tonewerk {

struct MemoryCapsa::State {
  Mutex mutex;
  std::vector<Request> requests GUARDED_BY(mutex);
  std::vector<std::string> cancelled GUARDED_BY(mutex);
  std::size_t reporterCount GUARDED_BY(mutex) = 0;
  bool accepts GUARDED_BY(mutex) = true;
  bool answersAtOnce GUARDED_BY(mutex) = false;
  ReplyMap reply GUARDED_BY(mutex);
};

class MemoryCapsa::MemoryReporter final : public FaultsignReporter {
 public:
  explicit MemoryReporter(std::shared_ptr<State> state) : state_(std::move(state)) {}

  [[nodiscard]] bool snapshotWithSignature(const FaultsignSignature& signature, double duration,
                                           const std::optional<ValueMap>& event,
                                           const std::optional<ValueMap>& payload, Reply reply) override {
    return take({true, signature, duration, event, payload, std::nullopt, std::move(reply)});
  }

  [[nodiscard]] bool startSessionWithSignature(const FaultsignSignature& signature, double duration,
                                               const std::optional<ValueMap>& events,
                                               const std::optional<ValueMap>& payload,
                                               const std::optional<ValueMap>& actions, Reply reply) override {
    return take({false, signature, duration, events, payload, actions, std::move(reply)});
  }

  void cancelSession(const std::string& identifier) override {
    const MutexLock lock(state_->mutex);
    state_->cancelled.push_back(identifier);
  }

 private:
  [[nodiscard]] bool take(const Request& request) {
    ReplyMap reply;
    {
      const MutexLock lock(state_->mutex);
      state_->requests.push_back(request);
      if (!state_->accepts) return false;
      if (!state_->answersAtOnce) return true;
      reply = state_->reply;
    }
    request.reply(reply);
    return true;
  }

  const std::shared_ptr<State> state_;
};

MemoryCapsa::MemoryCapsa() : state_(std::make_shared<State>()) {}
MemoryCapsa::~MemoryCapsa() { refuse(); }

std::unique_ptr<FaultsignReporter> MemoryCapsa::makeReporter() {
  const MutexLock lock(state_->mutex);
  ++state_->reporterCount;
  return std::make_unique<MemoryReporter>(state_);
}

void MemoryCapsa::refuse() {
  const MutexLock lock(state_->mutex);
  state_->accepts = false;
}

void MemoryCapsa::answerAtOnce(ReplyMap reply) {
  const MutexLock lock(state_->mutex);
  state_->answersAtOnce = true;
  state_->reply = std::move(reply);
}

void MemoryCapsa::answer(std::size_t at, const ReplyMap& reply) { requests().at(at).reply(reply); }

MemoryCapsa::ReplyMap MemoryCapsa::started(const std::string& sessionIdentifier) {
  return ValueMap{{kFaultsignReplySuccess, true}, {kFaultsignReplySessionID, sessionIdentifier}};
}

MemoryCapsa::ReplyMap MemoryCapsa::failed(FaultsignError reason) {
  return ValueMap{{kFaultsignReplySuccess, false},
                  {kFaultsignReplyReason, static_cast<std::int64_t>(reason)}};
}

std::vector<MemoryCapsa::Request> MemoryCapsa::requests() const {
  const MutexLock lock(state_->mutex);
  return state_->requests;
}

std::vector<std::string> MemoryCapsa::cancelled() const {
  const MutexLock lock(state_->mutex);
  return state_->cancelled;
}

std::size_t MemoryCapsa::reporterCount() const {
  const MutexLock lock(state_->mutex);
  return state_->reporterCount;
}

}  // namespace tonewerk
