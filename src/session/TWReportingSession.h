// SPDX-License-Identifier: Apache-2.0
#pragma once

#include <chrono>
#include <cstdint>
#include <functional>
#include <memory>
#include <optional>
#include <string>
#include <utility>
#include <vector>

#include "platform/SessionBook.h"
#include "protocol/AudioEvent.h"
#include "protocol/RequestSet.h"
#include "session/KeptBytesBudget.h"
#include "session/KeptMessages.h"
#include "session/NewestMessages.h"
#include "session/PreviousValues.h"
#include "session/TWReportingSessionMessage.h"
#include "session/TWReportingSessionWorkerClass.h"
#include "values/Mutex.h"
#include "values/Value.h"

namespace tonewerk {

class LogCategory;
class MessageShapes;

// Represents one reporting session of one client, with its stored messages and its workers.
//
//   initWithID() -> [setServiceType, configuration] -> start() -> sendMessage()... -> stop() -> start() again
//   ...
//
// The session takes messages before start(), too, and delivers them to the workers that start with the
// session. At start the consumers start first, then the producers, then the rest. At stop the producers
// stop first, so that the running consumers still get the messages that producers derive.
//
// Used on the work queue. configuration(), previousValues(), previousText(), clientProcessName() and the
// worker lists may be read on any thread.
class TWReportingSession : public std::enable_shared_from_this<TWReportingSession> {
  struct Private {};

 public:
  using ProcessIdentifiers = std::vector<std::int32_t>;
  using Workers = std::vector<TWReportingSessionWorkerClass::Worker>;
  using TransactionCompleteBlock = std::function<void(const std::optional<ReplyError>& error, bool success)>;

  // Makes the session and its start-on-init workers. The first process identifier is the owning process's.
  // The bytes that the session keeps are taken from `budget`; null gives the session a budget of its own.
  // `shapes` are those of its client's messages (MessageShapes.h); without them completed messages are trees.
  static std::shared_ptr<TWReportingSession> initWithID(ReporterID reporterID,
                                                        ProcessIdentifiers processIdentifiers,
                                                        std::shared_ptr<KeptBytesBudget> budget = nullptr,
                                                        std::shared_ptr<MessageShapes> shapes = nullptr);

  TWReportingSession(Private, ReporterID reporterID, ProcessIdentifiers processIdentifiers,
                     std::shared_ptr<KeptBytesBudget> budget, std::shared_ptr<MessageShapes> shapes);
  TWReportingSession(const TWReportingSession&) = delete;
  TWReportingSession& operator=(const TWReportingSession&) = delete;
  ~TWReportingSession();

  // Takes what the session itself takes, about, from the budget: the object and its workers. Returns false
  // when there is no room. For sessions that clients create; at most once.
  static constexpr std::size_t kOwnBytes = 4096;
  [[nodiscard]] bool takeOwnBytes();

  void setServiceType(AudioServiceType serviceType);

  // Adds the map's entries. Its "QMHostApplicationDisplayID" becomes the application name, unless the map
  // has an application name, too. Null does nothing. Returns false, and changes nothing, when the budget
  // has no room.
  [[nodiscard]] bool updateConfigurationWithContentsOfConfiguration(const ValueMap* configuration);

  // The session's life as reports refer to it. It begins with the start, or with the first message before it,
  // and ends with a stop. None when no book of lives is kept.
  const std::shared_ptr<SessionLife>& life() {
    if (life_ == nullptr) beginLife();
    return life_;
  }
  // Ends the life of a session that may not be started, and will not be used again. Does nothing when it has
  // ended.
  void endLife(SessionEnding ending);
  // What its life adds up.
  void countActivity(double seconds) { activeSeconds_ += seconds; }
  void countOverload() { ++overloads_; }

  void start();
  void startWorkersFromClasses(const std::vector<const TWReportingSessionWorkerClass*>& classes);
  void stop(SessionEnding ending = SessionEnding::kStopped);

  // Ask the processor for the memory that sendMessage() uses: for the session itself, and, when that is
  // there, for what it refers to. The second one reads where that is without the lock, because only the work
  // queue writes it.
  void prefetchItself() const;
  void prefetchForMessage() const NO_THREAD_SAFETY_ANALYSIS;

  // Logs how many messages were delivered but not kept since this was last logged, if there were any.
  // stop() and the destructor log it themselves.
  void logUnkeptMessages();

  using MessageReply = std::function<void(const std::optional<ReplyError>& error)>;
  // The budget of the client that sends a message.
  using Sender = std::shared_ptr<KeptBytesBudget>;
  // Normalises the message, decides whether it is redundant, stores a copy and delivers it, then replies
  // without an error. When the sender is a client of another user, the copy is taken from the sender's
  // budget, so that it takes no room from the session's own messages.
  void sendMessage(TWReportingSessionMessage& message, const MessageReply& reply = nullptr,
                   const Sender& sender = nullptr);
  // The same for a message that the daemon has made.
  void sendMessage(const std::shared_ptr<TWReportingSessionMessage>& message,
                   const MessageReply& reply = nullptr) {
    message->isDerived = true;
    sendMessage(*message, reply);
  }

  // The steps that normalise a message, in this order.
  static void addMissingDates(TWReportingSessionMessage& message);
  static void removeWhiteSpaceFromKeys(TWReportingSessionMessage& message);
  static void addAudioMessageTag(TWReportingSessionMessage& message);
  void addAppName(TWReportingSessionMessage& message) const;

  // True when the message repeats the newest stored message of its category and type in everything but its
  // times. An error is never redundant. Takes time proportional to the number of keys, however many
  // messages are stored.
  bool messageIsRedundant(const TWReportingSessionMessage& message) const;

  static double getEpochTimeFromTWReportingStateMessage(const TWReportingSessionMessage& message) {
    return message.epochTime();
  }
  static const std::vector<const TWReportingSessionWorkerClass*>& getAllWorkerClasses();

  ReporterID reporterID() const { return reporterID_; }
  const ProcessIdentifiers& processIdentifiers() const { return processIdentifiers_; }
  std::optional<std::string> clientProcessName() const;
  void setClientProcessName(std::optional<std::string> name);
  // The name of the process that the session book enters, empty when it is not known. Unlike
  // clientProcessName(), all sessions of a client have it, also one that replaces another on a change of
  // service type. To be set before the start.
  void setOwnerProcessName(SharedString name) { ownerProcessName_ = std::move(name); }
  AudioServiceType serviceType() const { return serviceType_; }
  const std::string& serviceName() const { return serviceName_; }
  ValueMap configuration() const;
  // TWReportingUtilityRetrieveAppName() of the configuration.
  const SharedString& applicationName() const { return applicationName_; }
  // The latest value of every key received.
  ValueMap previousValues() const;
  // That of one key as text; empty when no message had it.
  std::string previousText(std::string_view key) const;
  void addPreviousValues(const ValueMap& values);
  // Takes over the previous values of `other`, a session of this client that has left the budget, in place
  // of its own. They fit, because `other` took them from the same budget.
  void takePreviousValuesOf(const TWReportingSession& other);
  // Moves the bytes that the session keeps out of the client's budget. For a session that the client has
  // given up but that may live on.
  void leaveBudget();
  // Null when the session has none.
  MessageShapes* shapes() const { return shapes_.get(); }
  // The stored messages, without redundant ones, in order of arrival; sorted by time while the session stops.
  const KeptMessages& messages() const { return messages_; }
  // How many messages were received since the session was made or last stopped, and how many were redundant.
  std::uint64_t totalMessageCount() const { return totalMessageCount_; }
  std::uint64_t redundantMessageCount() const { return redundantMessageCount_; }
  // How many overloads were counted since then.
  std::uint64_t overloadCount() const { return overloads_; }
  // The monotonic time of the start; none while the session is not started.
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

  // Answers the start request, when the session stops. Set and called by service/.
  TransactionCompleteBlock transactionCompleteBlock;

 private:
  // One of consumingMessageWorkers(), with what does not change about it.
  struct Consumer {
    TWReportingSessionWorkerConsumerProtocol* worker;
    const TWReportingSessionWorkerClass* workerClass;
    bool handlesRedundantMessages;
  };
  enum class Order { kConsumersFirst, kProducersFirst };

  // The texts of the message that a start or a stop adds.
  struct LifecycleTexts;

  // A worker of the session, and the class that made it.
  struct MadeWorker {
    const TWReportingSessionWorkerClass* workerClass;
    TWReportingSessionWorkerClass::Worker worker;
  };

  // Does what addMissingDates(), addAudioMessageTag() and addAppName() do, but makes no tree. Returns false
  // when the message is a tree, or must become one; the message may then be complete in part.
  [[nodiscard]] bool completePacked(TWReportingSessionMessage& message) const;
  std::shared_ptr<TWReportingSessionMessage> lifecycleMessage(AudioEventType type,
                                                              const LifecycleTexts& texts) const;
  // In these, `debug` is null when debug lines are not written. `self` is this session. makeWorker() adds a
  // worker to `made` unless there is one or it does not apply to the session.
  void makeWorker(const TWReportingSessionWorkerClass& workerClass,
                  const std::shared_ptr<TWReportingSession>& self, const LogCategory* debug,
                  std::vector<MadeWorker>& made);
  void startWorker(TWReportingSessionWorkerProtocol& worker, const LogCategory* debug);
  // These read workers_ without the lock, because only the work queue writes them, and it calls these.
  bool hasWorkerOf(const TWReportingSessionWorkerClass& workerClass) const NO_THREAD_SAFETY_ANALYSIS;
  // Calls visit(TWReportingSessionWorkerProtocol&) once for each worker that there is at the call. Workers
  // that are both come with the role that `order` has first. The order within a role is the one in which they
  // were made.
  template <typename Visitor>
  void forEachWorker(Order order, Visitor visit) NO_THREAD_SAFETY_ANALYSIS;
  // The workers whose class has `role`.
  Workers workersWith(bool TWReportingSessionWorkerClass::*role) const;
  void deliver(const TWReportingSessionMessage& message);
  void beginLife();
  void endLife(SessionEnd end);
  // Empty when it is not known.
  SharedString knownApplication() const;
  // Enters the life in the book.
  void enterLife(const std::optional<SessionEnd>& end = std::nullopt);
  // The bytes that the session has taken from the budget.
  std::size_t keptBytes() const;
  // Returns the stored message; null when the budget has no room for it. `sender` is null for messages that
  // the session's own budget pays for.
  const TWReportingSessionMessage* store(const TWReportingSessionMessage& message,
                                         const Sender& sender = nullptr);
  bool isOfAnotherUser(const Sender& sender) const {
    return sender != nullptr && sender->account() != budget_->account();
  }
  // Gives the bytes of the stored messages back to those who paid for them.
  void giveBackMessageBytes();
  void logFullBudgetOnce(KeptBytesBudget& budget);
  void logUnkeptCount();
  void forgetMessages();

  const ReporterID reporterID_;
  const ProcessIdentifiers processIdentifiers_;
  std::shared_ptr<KeptBytesBudget> budget_;
  const std::shared_ptr<MessageShapes> shapes_;
  AudioServiceType serviceType_ = kServiceUnknown;
  std::string serviceName_;
  bool started_ = false;
  bool isSingleMessageSession_ = false;
  std::uint64_t totalMessageCount_ = 0;
  std::uint64_t redundantMessageCount_ = 0;
  std::optional<std::chrono::nanoseconds> startedAt_;
  std::shared_ptr<SessionLife> life_;
  double activeSeconds_ = 0.0;  // of this life
  std::uint64_t overloads_ = 0;

  KeptMessages messages_;
  NewestMessages newest_;
  std::size_t ownBytes_ = 0;      // taken from the budget for the session itself
  std::size_t messageBytes_ = 0;  // taken from the budget for messages_
  // What clients of other users have paid for messages_. Such clients are rare.
  struct Payment {
    Sender sender;
    std::size_t bytes = 0;
  };
  std::vector<Payment> payments_;
  std::uint64_t unkeptMessageCount_ = 0;  // delivered but not stored for lack of room, and not logged yet
  std::vector<Consumer> consumers_;       // in the order of consumingMessageWorkers(); workers_ owns them
  SharedString applicationName_;          // the one of configuration_
  SharedString ownerProcessName_;

  // The properties that any thread may read. Only the work queue writes them.
  mutable Mutex propertiesMutex_;
  std::optional<std::string> clientProcessName_ GUARDED_BY(propertiesMutex_);
  ValueMap configuration_ GUARDED_BY(propertiesMutex_);
  PreviousValues previousValues_ GUARDED_BY(propertiesMutex_);
  // In the order in which they were made. None is removed while the session lives.
  std::vector<MadeWorker> workers_ GUARDED_BY(propertiesMutex_);
};

}  // namespace tonewerk
