// SPDX-License-Identifier: Apache-2.0
#include "support/memory/reports/MemoryRuntrace.h"

#include <algorithm>
#include <utility>

namespace tonewerk {

class MemoryRuntrace::MemorySession final : public RuntraceSession {
 public:
  MemorySession(MemoryRuntrace& service, std::shared_ptr<Record> record)
      : service_(service), record_(std::move(record)) {}
  MemorySession(const MemorySession&) = delete;
  MemorySession& operator=(const MemorySession&) = delete;
  ~MemorySession() override { record_->isAlive = false; }

  void setDelegate(std::weak_ptr<RuntraceSessionDelegate> delegate) override {
    record_->delegate = std::move(delegate);
  }
  void startRuntrace() override {
    ++record_->starts;
    service_.schedule(record_, service_.onStart_);
  }
  void stopRuntrace() override {
    ++record_->stops;
    service_.schedule(record_, service_.onStop_);
  }
  bool isValid() const override { return record_->isValid; }

 private:
  MemoryRuntrace& service_;
  const std::shared_ptr<Record> record_;
};

MemoryRuntrace::Callback MemoryRuntrace::didStart(RuntraceError error) {
  return {.kind = Callback::Kind::kDidStart, .error = std::move(error), .location = {}};
}
MemoryRuntrace::Callback MemoryRuntrace::didStop(RuntraceError error) {
  return {.kind = Callback::Kind::kDidStop, .error = std::move(error), .location = {}};
}
MemoryRuntrace::Callback MemoryRuntrace::didComplete(std::string location) {
  return {.kind = Callback::Kind::kDidComplete, .error = {}, .location = std::move(location)};
}
MemoryRuntrace::Callback MemoryRuntrace::didFailToComplete(std::string error) {
  return {.kind = Callback::Kind::kDidComplete, .error = std::move(error), .location = {}};
}

MemoryRuntrace::MemoryRuntrace(ManualClock& clock)
    : clock_(clock), onStart_{didStart()}, onStop_{didStop(), didComplete("/traces/1")} {
  clock_.addAlarm(*this);
}
MemoryRuntrace::~MemoryRuntrace() { clock_.removeAlarm(*this); }

std::shared_ptr<RuntraceSession> MemoryRuntrace::makeSession(const RuntraceConfiguration& configuration) {
  records_.push_back(std::make_shared<Record>());
  records_.back()->configuration = configuration;
  return std::make_shared<MemorySession>(*this, records_.back());
}

bool MemoryRuntrace::callBack(std::size_t at, const Callback& callback) {
  return call(*records_.at(at), callback);
}

bool MemoryRuntrace::call(Record& record, const Callback& callback) {
  if (callback.error || callback.kind == Callback::Kind::kDidComplete) record.isValid = false;
  const auto delegate = record.delegate.lock();
  if (delegate == nullptr) return false;
  switch (callback.kind) {
    case Callback::Kind::kDidStart:
      delegate->runtraceDidStart(callback.error);
      break;
    case Callback::Kind::kDidStop:
      delegate->runtraceDidStop(callback.error);
      break;
    case Callback::Kind::kDidComplete: {
      const auto token = callback.error ? nullptr : std::make_shared<int>(0);
      record.token = token;
      delegate->runtraceDidComplete(callback.location, token, callback.error);
      break;
    }
  }
  return true;
}

void MemoryRuntrace::schedule(const std::shared_ptr<Record>& record, const Callbacks& callbacks) {
  for (const Callback& callback : callbacks) {
    if (callback.delay.count() == 0) {
      call(*record, callback);
      continue;
    }
    const std::chrono::nanoseconds due = clock_.monotonic() + callback.delay;
    const auto place = std::find_if(pending_.begin(), pending_.end(),
                                    [due](const Pending& pending) { return pending.due > due; });
    pending_.insert(place, {due, record, callback});
  }
}

std::optional<std::chrono::nanoseconds> MemoryRuntrace::nextDue() const {
  return pending_.empty() ? std::nullopt : std::optional(pending_.front().due);
}

void MemoryRuntrace::runNext() {
  const Pending next = pending_.front();
  pending_.erase(pending_.begin());
  call(*next.record, next.callback);
}

}  // namespace tonewerk
