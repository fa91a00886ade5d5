// SPDX-License-Identifier: Apache-2.0
#pragma once

#include <chrono>
#include <cstdint>
#include <functional>
#include <map>
#include <memory>
#include <optional>
#include <string>
#include <utility>
#include <vector>

#include "protocol/AudioEvent.h"
#include "protocol/RequestSet.h"
#include "session/KeptBytesBudget.h"
#include "session/TWReportingSessionMessage.h"
#include "session/TWReportingSessionWorkerClass.h"
#include "values/Mutex.h"
#include "values/Value.h"

namespace tonewerk {

// One reporting session of one client: its stored messages and its workers.
//
//   initWithID() -> [setServiceType, configuration] -> start() -> sendMessage()... -> stop() -> start() again
//   ...
//
// Messages are taken, and delivered to the workers that start with the session, before start() too. At start
// the consumers start first, then the producers, then the rest; at stop the producers stop first, so that
// what they derive still passes the running consumers.
//
// Everything happens on the work queue; configuration(), previousValues(), clientProcessName() and the worker
// lists may be read from any thread. No operation fails towards its caller.
class TWReportingSession : public std::enable_shared_from_this<TWReportingSession> {
  struct Private {};

 public:
  using ProcessIdentifiers = std::vector<std::int32_t>;
  using Workers = std::vector<TWReportingSessionWorkerClass::Worker>;
  using TransactionCompleteBlock = std::function<void(const std::optional<ReplyError>& error, bool success)>;

  // Makes the session and its start-on-init workers. The first identifier is the owning process. What the
  // session keeps is taken from `budget`, of the session's own when null.
  static std::shared_ptr<TWReportingSession> initWithID(ReporterID reporterID,
                                                        ProcessIdentifiers processIdentifiers,
                                                        std::shared_ptr<KeptBytesBudget> budget = nullptr);

  TWReportingSession(Private, ReporterID reporterID, ProcessIdentifiers processIdentifiers,
                     std::shared_ptr<KeptBytesBudget> budget);
  TWReportingSession(const TWReportingSession&) = delete;
  TWReportingSession& operator=(const TWReportingSession&) = delete;
  ~TWReportingSession();

  void setServiceType(AudioServiceType serviceType);

  // Adds the map's entries; its "QMHostApplicationDisplayID" serves as application name unless it names one
  // itself. Null does nothing. False, and nothing changed, when there is no room left to keep them.
  bool updateConfigurationWithContentsOfConfiguration(const ValueMap* configuration);

  void start();
  void startWorkersFromClasses(const std::vector<const TWReportingSessionWorkerClass*>& classes);
  void stop();

  // Says how many messages were delivered but not kept, when there were some since this was last said. stop()
  // and the session's end say it themselves.
  void logUnkeptMessages();

  using MessageReply = std::function<void(const std::optional<ReplyError>& error)>;
  // Normalises, judges, stores and delivers the message, then replies without an error. The record becomes
  // the session's.
  void sendMessage(const std::shared_ptr<TWReportingSessionMessage>& message,
                   const MessageReply& reply = nullptr);

  // What a message goes through on its way in, in this order.
  static void addMissingDates(TWReportingSessionMessage& message);
  static void removeWhiteSpaceFromKeys(TWReportingSessionMessage& message);
  static void addAudioMessageTag(TWReportingSessionMessage& message);
  void addAppName(TWReportingSessionMessage& message) const;

  // Whether it repeats, in all but its times, the newest stored message of its category and type. Errors
  // never do. O(keys), however many messages are stored.
  bool messageIsRedundant(const TWReportingSessionMessage& message) const;

  static double getEpochTimeFromTWReportingStateMessage(const TWReportingSessionMessage& message) {
    return message.epochTime();
  }
  static const std::vector<const TWReportingSessionWorkerClass*>& getAllWorkerClasses();

  ReporterID reporterID() const { return reporterID_; }
  const ProcessIdentifiers& processIdentifiers() const { return processIdentifiers_; }
  std::optional<std::string> clientProcessName() const;
  void setClientProcessName(std::optional<std::string> name);
  AudioServiceType serviceType() const { return serviceType_; }
  const std::string& serviceName() const { return serviceName_; }
  ValueMap configuration() const;
  // The latest value of every key received.
  ValueMap previousValues() const;
  void addPreviousValues(const ValueMap& values);
  // The client has given the session up: what it keeps no longer counts against the client, however long
  // others hold it.
  void leaveBudget();
  // Not redundant ones, in order of arrival; sorted by time while the session stops.
  const TWReportingSessionMessages& messages() const { return messages_; }
  // Received since the session was made or last stopped, and how many of them were redundant.
  std::uint64_t totalMessageCount() const { return totalMessageCount_; }
  std::uint64_t redundantMessageCount() const { return redundantMessageCount_; }
  // Monotonic time; none while it is not started.
  std::optional<std::chrono::nanoseconds> startedAt() const { return startedAt_; }
  bool started() const { return started_; }
  bool isSingleMessageSession() const { return isSingleMessageSession_; }
  void setSingleMessageSession(bool isSingle) { isSingleMessageSession_ = isSingle; }

  Workers messageWorkers() const;
  Workers consumingMessageWorkers() const;
  Workers producingMessageWorkers() const;
  std::vector<const TWReportingSessionWorkerClass*> initializedWorkerClasses() const;
  std::size_t workerInstanceCount() const;

  std::string description() const;

  // Held for the request layer: the start request's answer, given when the session stops.
  TransactionCompleteBlock transactionCompleteBlock;

 private:
  using Consumer = std::shared_ptr<TWReportingSessionWorkerConsumerProtocol>;
  enum class Order { kConsumersFirst, kProducersFirst };

  std::shared_ptr<TWReportingSessionMessage> lifecycleMessage(AudioEventType type,
                                                              const std::string& method) const;
  void makeWorker(const TWReportingSessionWorkerClass& workerClass);
  bool hasWorkerOf(const TWReportingSessionWorkerClass& workerClass) const;
  void startWorker(TWReportingSessionWorkerProtocol& worker);
  Workers workersInOrder(Order order) const;
  void deliver(const TWReportingSessionMessage& message);
  // Taken from the budget.
  std::size_t keptBytes() const;
  // False when there is no room left to keep it.
  [[nodiscard]] bool store(const std::shared_ptr<TWReportingSessionMessage>& message);
  void rememberAsNewest(const TWReportingSessionMessage& message);
  // Adds `more` to `map` when the budget has room for it.
  [[nodiscard]] bool mergeWithinBudget(ValueMap& map, const ValueMap& more) REQUIRES(propertiesMutex_);
  void sayOnceThatNoMoreIsKept();
  void sayHowManyWereNotKept();
  void forgetMessages();

  const ReporterID reporterID_;
  const ProcessIdentifiers processIdentifiers_;
  std::shared_ptr<KeptBytesBudget> budget_;
  AudioServiceType serviceType_ = kServiceUnknown;
  std::string serviceName_;
  bool started_ = false;
  bool isSingleMessageSession_ = false;
  std::uint64_t totalMessageCount_ = 0;
  std::uint64_t redundantMessageCount_ = 0;
  std::optional<std::chrono::nanoseconds> startedAt_;

  TWReportingSessionMessages messages_;
  // The newest stored message of each category and type. Ordered: clients choose the keys, and must not be
  // able to choose colliding ones.
  std::map<std::pair<AudioEventCategory, AudioEventType>, const TWReportingSessionMessage*> newest_;
  std::size_t messageBytes_ = 0;          // taken from the budget for messages_
  std::uint64_t unkeptMessageCount_ = 0;  // delivered, for want of room not stored, and not yet said
  std::vector<Consumer> consumers_;       // consumingMessageWorkers_ under their consumer face

  // The properties that any thread may read. Only the work queue writes them.
  mutable Mutex propertiesMutex_;
  std::optional<std::string> clientProcessName_ GUARDED_BY(propertiesMutex_);
  ValueMap configuration_ GUARDED_BY(propertiesMutex_);
  ValueMap previousValues_ GUARDED_BY(propertiesMutex_);
  Workers messageWorkers_ GUARDED_BY(propertiesMutex_);
  Workers consumingMessageWorkers_ GUARDED_BY(propertiesMutex_);
  Workers producingMessageWorkers_ GUARDED_BY(propertiesMutex_);
  std::vector<const TWReportingSessionWorkerClass*> initializedWorkerClasses_ GUARDED_BY(propertiesMutex_);
};

}  // namespace tonewerk
