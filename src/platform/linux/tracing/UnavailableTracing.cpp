// SPDX-License-Identifier: Apache-2.0
#include "platform/linux/tracing/UnavailableTracing.h"

#include <utility>

#include "values/Mutex.h"

namespace tonewerk {
namespace {

class UnavailableSession final : public RuntraceSession {
 public:
  explicit UnavailableSession(std::string reason) : reason_(std::move(reason)) {}

  void setDelegate(std::weak_ptr<RuntraceSessionDelegate> delegate) override {
    const MutexLock lock(mutex_);
    delegate_ = std::move(delegate);
  }
  void startRuntrace() override {
    std::shared_ptr<RuntraceSessionDelegate> delegate;
    {
      const MutexLock lock(mutex_);
      delegate = delegate_.lock();
    }
    if (delegate != nullptr) delegate->runtraceDidStart(reason_);
  }
  void stopRuntrace() override {}
  bool isValid() const override { return false; }

 private:
  const std::string reason_;
  Mutex mutex_;
  std::weak_ptr<RuntraceSessionDelegate> delegate_ GUARDED_BY(mutex_);
};

}  // namespace

std::shared_ptr<RuntraceSession> UnavailableRuntrace::makeSession(const RuntraceConfiguration&) {
  return std::make_shared<UnavailableSession>(reason_);
}

std::unique_ptr<KolviModel> UnavailableKolvi::openModel(const std::string&, std::string& problem) {
  problem = reason_;
  return nullptr;
}

Tracing makeUnavailableTracing(const std::string& reason) {
  return {std::make_unique<UnavailableRuntrace>(reason), std::make_unique<UnavailableKolvi>(reason)};
}

}  // namespace tonewerk
