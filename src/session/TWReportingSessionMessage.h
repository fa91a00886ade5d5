// SPDX-License-Identifier: Apache-2.0
#pragma once

#include <algorithm>
#include <atomic>
#include <cstddef>
#include <memory>
#include <optional>
#include <string>
#include <utility>
#include <vector>

#include "platform/Metricon.h"
#include "protocol/AudioEvent.h"
#include "values/Value.h"

namespace tonewerk {

struct TWReportingSessionWorkerClass;

// What few messages have. It takes one pointer while there is nothing.
class MessageDetails {
 public:
  using WorkerClasses = std::vector<const TWReportingSessionWorkerClass*>;

  MessageDetails() = default;
  MessageDetails(const MessageDetails& other)
      : content_(other.empty() ? nullptr : std::make_unique<Content>(*other.content_)) {}
  MessageDetails(MessageDetails&&) noexcept = default;
  MessageDetails& operator=(MessageDetails other) noexcept {
    content_ = std::move(other.content_);
    return *this;
  }
  ~MessageDetails() = default;

  bool empty() const { return content_ == nullptr; }

  // If not empty, only consumers of these classes get the message.
  const WorkerClasses& destinationWorkers() const { return empty() ? kNoWorkers : content_->workers; }
  bool areMeantFor(const TWReportingSessionWorkerClass& workerClass) const {
    const WorkerClasses& workers = destinationWorkers();
    return workers.empty() || std::find(workers.begin(), workers.end(), &workerClass) != workers.end();
  }
  void setDestinationWorkers(WorkerClasses workers) { content().workers = std::move(workers); }

  // What a summary sums up.
  std::optional<TimeStretch> stretch() const { return empty() ? std::nullopt : content_->stretch; }
  void setStretch(const TimeStretch& stretch) { content().stretch = stretch; }

 private:
  struct Content {
    WorkerClasses workers;
    std::optional<TimeStretch> stretch;
  };
  static const WorkerClasses kNoWorkers;

  Content& content() {
    if (empty()) content_ = std::make_unique<Content>();
    return *content_;
  }

  std::unique_ptr<Content> content_;
};

// Holds one message of a session, which a client sent or the daemon made.
//
// A session lends its messages to its workers. They are changed only on the work queue. A worker that keeps
// a message beyond a call, or changes it, takes a copy.
class TWReportingSessionMessage {
 public:
  // The record shares the payload's values, but has a map of its own.
  TWReportingSessionMessage(ValueMap payload, AudioEventCategory messageCategory, AudioEventType messageType);

  // Returns a copy without the details: a copy may go to any worker.
  std::shared_ptr<TWReportingSessionMessage> copyWithZone() const;

  // "category=Playback type=Start {...}"
  std::string description() const;

  // The "twreporting_timestamp" in seconds since 1970; 0 when there is none.
  double epochTime() const;

  // Sorts by epochTime(), ascending and stable. A time that is not a number counts as 0. Returns false when
  // the messages were in order.
  static bool sortMessages(std::vector<std::shared_ptr<TWReportingSessionMessage>>& messages);

  MessageDetails details;
  ValueMap message;
  AudioEventCategory category;
  AudioEventType type;
  bool isRedundant : 1 = false;
  bool isSessionStarted : 1 = false;
  bool isDerived : 1 = false;  // the daemon has made it

  // Locks this record. BasicLockable.
  void lock() const;
  void unlock() const;

 private:
  // Takes 1 byte instead of the 40 of a mutex; there is one in each stored message. A copy is not locked.
  struct Locked {
    Locked() = default;
    Locked(const Locked&) noexcept {}
    Locked& operator=(const Locked&) noexcept { return *this; }
    ~Locked() = default;

    std::atomic_flag flag;
  };
  mutable Locked locked_;
};

static_assert(sizeof(TWReportingSessionMessage) == 24, "sessions keep very many");

using TWReportingSessionMessages = std::vector<std::shared_ptr<TWReportingSessionMessage>>;

}  // namespace tonewerk
