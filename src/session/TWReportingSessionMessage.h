// SPDX-License-Identifier: Apache-2.0
#pragma once

#include <atomic>
#include <cstddef>
#include <initializer_list>
#include <memory>
#include <string>
#include <vector>

#include "protocol/AudioEvent.h"
#include "values/Value.h"

namespace tonewerk {

struct TWReportingSessionWorkerClass;

// A list of worker classes. It takes one pointer while it is empty, which it is in nearly all messages.
class WorkerClassList {
 public:
  using value_type = const TWReportingSessionWorkerClass*;
  using const_iterator = const value_type*;

  WorkerClassList() = default;
  WorkerClassList(std::initializer_list<value_type> classes)
      : classes_(classes.size() == 0 ? nullptr : std::make_unique<const std::vector<value_type>>(classes)) {}
  WorkerClassList(const WorkerClassList& other)
      : classes_(other.empty() ? nullptr : std::make_unique<const std::vector<value_type>>(*other.classes_)) {
  }
  WorkerClassList(WorkerClassList&&) noexcept = default;
  WorkerClassList& operator=(WorkerClassList other) noexcept {
    classes_ = std::move(other.classes_);
    return *this;
  }
  ~WorkerClassList() = default;

  bool empty() const { return classes_ == nullptr; }
  std::size_t size() const { return empty() ? 0 : classes_->size(); }
  const_iterator begin() const { return empty() ? nullptr : classes_->data(); }
  const_iterator end() const { return begin() + size(); }

 private:
  std::unique_ptr<const std::vector<value_type>> classes_;
};

// Holds one message of a session, which a client sent or the daemon made.
//
// A session lends its messages to its workers. They are changed only on the work queue. A worker that keeps
// a message beyond a call, or changes it, takes a copy.
class TWReportingSessionMessage {
 public:
  // The record shares the payload's values, but has a map of its own.
  TWReportingSessionMessage(ValueMap payload, AudioEventCategory messageCategory, AudioEventType messageType);

  // Returns a copy without the destination workers: a copy may go to any worker.
  std::shared_ptr<TWReportingSessionMessage> copyWithZone() const;

  // "category=Playback type=Start {...}"
  std::string description() const;

  // The "twreporting_timestamp" in seconds since 1970; 0 when there is none.
  double epochTime() const;

  // Sorts by epochTime(), ascending and stable. A time that is not a number counts as 0. Returns false when
  // the messages were in order.
  static bool sortMessages(std::vector<std::shared_ptr<TWReportingSessionMessage>>& messages);

  // If not empty, only consumers of these classes get the message.
  WorkerClassList destinationWorkers;
  ValueMap message;
  AudioEventCategory category;
  AudioEventType type;
  bool isRedundant : 1 = false;
  bool isSessionStarted : 1 = false;

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
