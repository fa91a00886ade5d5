// SPDX-License-Identifier: Apache-2.0
#include "session/TWReportingSession.h"

#include <algorithm>
#include <cassert>
#include <iterator>
#include <mutex>

#include "platform/Clock.h"
#include "platform/JournalPosition.h"
#include "platform/Log.h"
#include "session/MessageShapes.h"
#include "session/ReasonTrace.h"
#include "session/TWReportingContext.h"
#include "session/TWReportingKeys.h"
#include "session/TWReportingTracePoint.h"
#include "session/TWReportingUtility.h"
#include "values/Prefetch.h"
#include "values/ValueView.h"

namespace tonewerk {
namespace {

constexpr double kOldestTimestampSeconds = 31'536'000.0;  // 365 days

const Value kUnknownName("Unknown");
const Value kNilText("nil");
const Value kYes("YES");
const Value kNo("NO");
const SharedString kMethod("method");
const SharedString kReporterID("reporterid");

std::string_view yesOrNo(bool answer) { return answer ? "YES" : "NO"; }

// What takes the place of a message's time.
struct ReplacedDate {
  ValueView invalid;  // the value of "invalid_timestamp"
  double now;
};

// None for a time that is neither missing nor too old.
std::optional<ReplacedDate> replacedDate(ValueView time) {
  const Clock& clock = TWReportingContext::current().platform().clock;
  if (!time) return ReplacedDate{ValueView(kNilText), clock.now()};
  if (time.number() < clock.coarseNow() - kOldestTimestampSeconds) return ReplacedDate{time, clock.now()};
  return std::nullopt;
}

// Returns null when the session's debug lines are not written. It is asked once for many lines.
const LogCategory* debugCategory() {
  const LogCategory* category = TWReportingSessionCategory();
  return category->isEnabled(LogLevel::kDebug) ? category : nullptr;
}

// When the request came for which this thread works. That is also known when the journal is played.
double timeOfRequest(const Clock& clock) {
  const double at = JournalPosition::current().at();
  return at > 0.0 ? at : clock.now();
}

}  // namespace

// Made once, because every session adds the same texts.
struct TWReportingSession::LifecycleTexts {
  explicit LifecycleTexts(const std::string& name)
      : method(name),
        messagesAt("messages_at_" + name),
        uniqueMessagesAt("unique_messages_at_" + name),
        runningAt("running_at_" + name) {}

  static const LifecycleTexts kStart;
  static const LifecycleTexts kStop;

  Value method;
  SharedString messagesAt;
  SharedString uniqueMessagesAt;
  SharedString runningAt;
};

const TWReportingSession::LifecycleTexts TWReportingSession::LifecycleTexts::kStart("start");
const TWReportingSession::LifecycleTexts TWReportingSession::LifecycleTexts::kStop("stop");

std::shared_ptr<TWReportingSession> TWReportingSession::initWithID(ReporterID reporterID,
                                                                   ProcessIdentifiers processIdentifiers,
                                                                   std::shared_ptr<KeptBytesBudget> budget,
                                                                   std::shared_ptr<MessageShapes> shapes) {
  assert(TWReportingUtilityIsOnReportingServerQueue());
  const auto& registry = TWReportingContext::current().workerRegistry();
  if (budget == nullptr) budget = std::make_shared<KeptBytesBudget>();
  auto session = std::make_shared<TWReportingSession>(Private(), reporterID, std::move(processIdentifiers),
                                                      std::move(budget), std::move(shapes));
  session->startWorkersFromClasses(registry.startOnInitClasses());
  infoLog(TWReportingSessionCategory(), "created reporting session for ID: %lli", reporterID);
  emitTracePoint(TWReportingTracePoint::kSessionCreated);
  return session;
}

TWReportingSession::TWReportingSession(Private, ReporterID reporterID, ProcessIdentifiers processIdentifiers,
                                       std::shared_ptr<KeptBytesBudget> budget,
                                       std::shared_ptr<MessageShapes> shapes)
    : reporterID_(reporterID),
      processIdentifiers_(std::move(processIdentifiers)),
      budget_(std::move(budget)),
      shapes_(std::move(shapes)),
      serviceName_(TWReportingUtilityGenerateServiceNameFromServiceType(kServiceUnknown)),
      applicationName_(TWReportingUtilityRetrieveAppName({})) {}

TWReportingSession::~TWReportingSession() {
  logUnkeptCount();
  emitTracePoint(TWReportingTracePoint::kSessionReleased);
  infoLog(TWReportingSessionCategory(), "deallocing this session %lli", reporterID_);
  giveBackMessageBytes();
  budget_->give(keptBytes());
}

std::size_t TWReportingSession::keptBytes() const {
  const MutexLock lock(propertiesMutex_);
  return ownBytes_ + messageBytes_ + configuration_.bytes() + previousValues_.bytes();
}

bool TWReportingSession::takeOwnBytes() {
  assert(ownBytes_ == 0);
  if (!budget_->take(kOwnBytes)) return false;
  ownBytes_ = kOwnBytes;
  return true;
}

void TWReportingSession::leaveBudget() {
  assert(TWReportingUtilityIsOnReportingServerQueue());
  const std::size_t kept = keptBytes();
  budget_->give(kept);
  budget_ = std::make_shared<KeptBytesBudget>(kept);
  [[maybe_unused]] const bool fits = budget_->take(kept);
  assert(fits);
}

void TWReportingSession::setServiceType(AudioServiceType serviceType) {
  assert(TWReportingUtilityIsOnReportingServerQueue());
  serviceType_ = serviceType;
  serviceName_ = TWReportingUtilityGenerateServiceNameFromServiceType(serviceType);
  infoLog(TWReportingSessionCategory(), "setting service type %@", serviceName_);
}

bool TWReportingSession::updateConfigurationWithContentsOfConfiguration(const ValueMap* configuration) {
  assert(TWReportingUtilityIsOnReportingServerQueue());
  if (configuration == nullptr) return true;
  ValueMap update;
  if (const Value* name = configuration->find(TWReportingQMApplicationName)) {
    update.set(TWReportingApplicationName, *name);
  }
  update.merge(*configuration);
  {
    const MutexLock lock(propertiesMutex_);
    if (!mergeWithin(*budget_, configuration_, update)) return false;
    applicationName_ = TWReportingUtilityRetrieveAppName(configuration_);
  }
  if (life_ != nullptr) enterLife();
  return true;
}

void TWReportingSession::beginLife() {
  assert(TWReportingUtilityIsOnReportingServerQueue());
  const Platform& platform = TWReportingContext::current().platform();
  if (platform.sessionBook == nullptr) return;
  activeSeconds_ = 0.0;
  overloads_ = 0;
  life_ = std::make_shared<SessionLife>(SessionBeginning{.reporterID = reporterID_,
                                                         .at = timeOfRequest(platform.clock),
                                                         .request = JournalPosition::current().sequence(),
                                                         .service = SharedString(serviceName_)});
  enterLife();
  if (auto* reasons = ReasonTrace::current()) reasons->lifeBegan(*this, life_->beginning);
}

void TWReportingSession::enterLife(const std::optional<SessionEnd>& end) {
  TWReportingContext::current().platform().sessionBook->enter(life_, knownApplication(), ownerProcessName_,
                                                              end);
}

SharedString TWReportingSession::knownApplication() const {
  return ValueView(kUnknownName).asText() == applicationName_.view() ? SharedString() : applicationName_;
}

void TWReportingSession::endLife(SessionEnding ending) {
  endLife({.ending = ending, .messages = totalMessageCount_, .redundantMessages = redundantMessageCount_});
}

void TWReportingSession::endLife(SessionEnd end) {
  assert(TWReportingUtilityIsOnReportingServerQueue());
  if (life_ == nullptr) return;
  TWReportingContext& context = TWReportingContext::current();
  // A session that a recovery ends was open when the daemon went.
  const RequestJournal& journal = context.journal();
  if (journal.isRecovering() && !journal.isPlaying()) end.ending = SessionEnding::kInterrupted;
  end.at = timeOfRequest(context.platform().clock);
  end.activeSeconds = activeSeconds_;
  end.overloads = overloads_;
  enterLife(end);
  if (auto* reasons = ReasonTrace::current()) reasons->lifeEnded(*this, end);
  life_.reset();
}

void TWReportingSession::start() {
  assert(TWReportingUtilityIsOnReportingServerQueue());
  store(*lifecycleMessage(kTypeStart,
                          LifecycleTexts::kStart));  // a start counts also when its message is not kept
  infoLog(TWReportingSessionCategory(), "start called. reporterID=%lli", reporterID_);
  if (started_) {
    infoLog(TWReportingSessionCategory(), "%lli is already started", reporterID_);
    return;
  }
  debugLog(TWReportingSessionCategory(), "self.started==false. starting. reporterID=%lli", reporterID_);
  started_ = true;
  startedAt_ = TWReportingContext::current().platform().clock.monotonic();
  emitTracePoint(TWReportingTracePoint::kSessionStarted);
  (void)life();
  startWorkersFromClasses(TWReportingContext::current().workerRegistry().validClasses());
}

void TWReportingSession::startWorkersFromClasses(
    const std::vector<const TWReportingSessionWorkerClass*>& classes) {
  assert(TWReportingUtilityIsOnReportingServerQueue());
  const LogCategory* debug = debugCategory();
  const std::shared_ptr<TWReportingSession> self = shared_from_this();
  consumers_.reserve(classes.size());
  std::vector<MadeWorker> made;
  made.reserve(classes.size());
  for (const TWReportingSessionWorkerClass* workerClass : classes) {
    makeWorker(*workerClass, self, debug, made);
  }
  {
    const MutexLock lock(propertiesMutex_);
    workers_.reserve(workers_.size() + made.size());
    std::move(made.begin(), made.end(), std::back_inserter(workers_));
  }
  forEachWorker(Order::kConsumersFirst, [&](TWReportingSessionWorkerProtocol& worker) {
    if (!worker.started) startWorker(worker, debug);
  });
}

void TWReportingSession::makeWorker(const TWReportingSessionWorkerClass& workerClass,
                                    const std::shared_ptr<TWReportingSession>& self, const LogCategory* debug,
                                    std::vector<MadeWorker>& made) {
  if (isSingleMessageSession_ && !workerClass.handleSingleMessageSession) {
    debugLog(debug,
             "Skipping TWReportingSessionWorker for single message session. action=skipped worker=%@ "
             "reporterID=%lli",
             workerClass, reporterID_);
    return;
  }
  if (workerClass.isForLiveSessions && TWReportingContext::current().journal().isPlaying()) return;
  const auto isOfClass = [&](const MadeWorker& worker) { return worker.workerClass == &workerClass; };
  if (hasWorkerOf(workerClass) || std::any_of(made.begin(), made.end(), isOfClass)) {
    debugLog(debug, "TWReportingSessionWorker already initialized. action=skipped worker=%@ reporterID=%lli",
             workerClass, reporterID_);
    return;
  }
  debugLog(debug, "Initializing TWReportingSessionWorker. action=init worker=%@ reporterID=%lli", workerClass,
           reporterID_);
  auto worker = workerClass.initWithSession(self);
  if (worker == nullptr) {
    // A later start tries again, because the service type may have changed by then.
    debugLog(debug, "TWReportingSessionWorker failed to initialize. action=failure worker=%@ reporterID=%lli",
             workerClass, reporterID_);
    return;
  }
  if (workerClass.isConsumer) {
    auto& consumer = *worker->asConsumer();
    consumers_.push_back({&consumer, &consumer.workerClass(), consumer.handleRedundantMessages()});
  }
  made.push_back({&workerClass, std::move(worker)});
  debugLog(debug, "TWReportingSessionWorker action=added worker=%@ reporterID=%lli", workerClass,
           reporterID_);
}

bool TWReportingSession::hasWorkerOf(const TWReportingSessionWorkerClass& workerClass) const {
  return std::any_of(workers_.begin(), workers_.end(),
                     [&](const MadeWorker& made) { return made.workerClass == &workerClass; });
}

void TWReportingSession::startWorker(TWReportingSessionWorkerProtocol& worker, const LogCategory* debug) {
  const std::optional<bool> result = worker.start();
  worker.started = result.value_or(true);
  if (!result) return;
  debugLog(debug, "TWReportingSessionWorker action=start worker=%@ started=%@ reporterID=%lli",
           worker.workerClass(), yesOrNo(worker.started), reporterID_);
}

// By index, because a worker may make the session make others, which moves them.
template <typename Visitor>
void TWReportingSession::forEachWorker(Order order, Visitor visit) {
  using Class = TWReportingSessionWorkerClass;
  const bool consumersFirst = order == Order::kConsumersFirst;
  const auto first = consumersFirst ? &Class::isConsumer : &Class::isProducer;
  const auto second = consumersFirst ? &Class::isProducer : &Class::isConsumer;
  const auto rankOf = [&](const Class& made) { return made.*first ? 0 : made.*second ? 1 : 2; };
  const std::size_t count = workers_.size();
  for (int rank = 0; rank < 3; ++rank) {
    for (std::size_t at = 0; at < count; ++at) {
      if (rankOf(*workers_[at].workerClass) == rank) visit(*workers_[at].worker);
    }
  }
}

void TWReportingSession::prefetchItself() const { prefetchLines(this, sizeof(*this)); }

void TWReportingSession::prefetchForMessage() const {
  newest_.prefetchKinds();
  previousValues_.prefetchShapes();
  messages_.prefetchNext();
  for (const Consumer& consumer : consumers_) prefetch(consumer.worker);
}

void TWReportingSession::sendMessage(TWReportingSessionMessage& message, const MessageReply& reply,
                                     const Sender& sender) {
  assert(TWReportingUtilityIsOnReportingServerQueue());
  ++totalMessageCount_;
  if (!completePacked(message)) {
    addMissingDates(message);
    removeWhiteSpaceFromKeys(message);
    addAudioMessageTag(message);
    addAppName(message);
  }
  emitTracePoint(TWReportingTracePoint::kMessageReceived);
  message.isSessionStarted = started_;
  message.isRedundant = messageIsRedundant(message);
  if (message.isRedundant) ++redundantMessageCount_;
  debugLog(TWReportingSessionCategory(),
           "TWReportingSessionWorker action=sendMessage reporterID=%lli app=%@ redundant=%@ message=%@",
           reporterID_, applicationName_, yesOrNo(message.isRedundant), message);
  const bool isForeign = isOfAnotherUser(sender);
  // Half of the budget stays for what the session's own client sends.
  if (!isForeign || budget_->used() < budget_->limit() / 2) addPreviousValues(message.message);
  const TWReportingSessionMessage* stored =
      message.isRedundant ? nullptr : store(message, isForeign ? sender : nullptr);
  if (!message.isRedundant && stored == nullptr) ++unkeptMessageCount_;
  if (auto* reasons = ReasonTrace::current()) {
    const TWReportingSessionMessage* repeated =
        message.isRedundant ? newest_.find({message.category, message.type}) : nullptr;
    reasons->messageArrived(*this, {message, stored, repeated});
  }
  // A worker that keeps the payload shares that of the stored message, which takes memory anyway. A copy,
  // because a worker may stop the session.
  if (stored == nullptr) {
    deliver(message);
  } else {
    deliver(TWReportingSessionMessage(*stored));
  }
  if (reply) reply(std::nullopt);
}

void TWReportingSession::deliver(const TWReportingSessionMessage& message) {
  const LogCategory* debug = debugCategory();
  // By index, because a worker that sends or starts the session may add consumers.
  for (std::size_t at = 0; at < consumers_.size(); ++at) {
    const Consumer consumer = consumers_[at];
    if (!consumer.worker->started) continue;
    if (message.isRedundant && !consumer.handlesRedundantMessages) continue;
    const TWReportingSessionWorkerClass& workerClass = *consumer.workerClass;
    if (!message.details.areMeantFor(workerClass)) continue;
    if (workerClass.handledTypes.contains(message.type)) consumer.worker->handleMessage(message);
    if (debug == nullptr) continue;
    debugLog(debug, "TWReportingSessionWorker action=handleMessage worker=%@ reporterID=%lli", workerClass,
             reporterID_);
  }
}

void TWReportingSession::stop(SessionEnding ending) {
  assert(TWReportingUtilityIsOnReportingServerQueue());
  const SessionEnd end{
      .ending = ending, .messages = totalMessageCount_, .redundantMessages = redundantMessageCount_};
  store(*lifecycleMessage(kTypeStop,
                          LifecycleTexts::kStop));  // a stop counts even when its message is not stored
  debugLog(TWReportingSessionCategory(), "stop called. reporterID=%lli", reporterID_);
  if (!started_) return logUnkeptCount();
  debugLog(TWReportingSessionCategory(), "ending session. reporterID=%lli", reporterID_);
  emitTracePoint(TWReportingTracePoint::kSessionEnding);
  if (messages_.sortByTime()) {
    for (const auto* message : messages_) newest_.set({message->category, message->type}, message);
  }

  if (auto* reasons = ReasonTrace::current()) reasons->stopping(*this);
  const LogCategory* debug = debugCategory();
  forEachWorker(Order::kProducersFirst, [&](TWReportingSessionWorkerProtocol& worker) {
    if (!worker.started) return;
    worker.stop();
    worker.started = false;
    debugLog(debug, "TWReportingSessionWorker action=stop worker=%@ reporterID=%lli", worker.workerClass(),
             reporterID_);
  });
  logUnkeptCount();
  endLife(end);
  forgetMessages();
  totalMessageCount_ = 0;
  redundantMessageCount_ = 0;
  overloads_ = 0;
  started_ = false;
  startedAt_.reset();
}

std::shared_ptr<TWReportingSessionMessage> TWReportingSession::lifecycleMessage(
    AudioEventType type, const LifecycleTexts& texts) const {
  constexpr std::size_t kEntries = 8;
  const std::uint64_t count = messages_.size();
  ValueMap payload;
  payload.reserve(kEntries);
  payload.add(kMethod, texts.method);
  payload.add(texts.messagesAt, count);
  payload.add(texts.uniqueMessagesAt, count);
  payload.add(kReporterID, reporterID_);
  payload.add(texts.runningAt, started_ ? kYes : kNo);
  // What addMissingDates() and addAudioMessageTag() add.
  TWReportingContext& context = TWReportingContext::current();
  payload.add(TWReportingInternalEventInvalidTimestamp, kNilText);
  payload.add(TWReportingInternalEventEpochTime, context.platform().clock.now());
  payload.add(TWReportingInternalEventAudioTag, context.names().audioTag(kCategorySetup, type));
  return std::make_shared<TWReportingSessionMessage>(std::move(payload), kCategorySetup, type);
}

const TWReportingSessionMessage* TWReportingSession::store(const TWReportingSessionMessage& message,
                                                           const Sender& sender) {
  const NewestMessages::Kind kind{message.category, message.type};
  const bool isNewKind = newest_.find(kind) == nullptr;
  const std::size_t bytes = messages_.bytesFor(message) + (isNewKind ? NewestMessages::kKindBytes : 0);
  KeptBytesBudget& payer = sender == nullptr ? *budget_ : *sender;
  if (!payer.take(bytes)) {
    logFullBudgetOnce(payer);
    return nullptr;
  }
  if (sender == nullptr) {
    messageBytes_ += bytes;
  } else {
    if (payments_.empty() || payments_.back().sender != sender) payments_.push_back({sender, 0});
    payments_.back().bytes += bytes;
  }
  const TWReportingSessionMessage* stored = &messages_.add(message);
  newest_.set(kind, stored);
  return stored;
}

void TWReportingSession::logFullBudgetOnce(KeptBytesBudget& budget) {
  if (!budget.isFirstRefusal()) return;
  errorLog(
      TWReportingSessionCategory(),
      "the client's sessions keep %zu bytes, the most is %zu: further messages are delivered but not kept. "
      "reporterID=%lli",
      budget.used(), budget.limit(), reporterID_);
}

void TWReportingSession::logUnkeptMessages() {
  assert(TWReportingUtilityIsOnReportingServerQueue());
  logUnkeptCount();
}

void TWReportingSession::logUnkeptCount() {
  if (unkeptMessageCount_ == 0) return;
  errorLog(TWReportingSessionCategory(), "messages delivered but not kept: count=%lu reporterID=%lli",
           std::exchange(unkeptMessageCount_, 0), reporterID_);
}

void TWReportingSession::forgetMessages() {
  newest_.clear();
  messages_.clear();
  giveBackMessageBytes();
}

void TWReportingSession::giveBackMessageBytes() {
  budget_->give(std::exchange(messageBytes_, 0));
  for (const Payment& payment : payments_) payment.sender->give(payment.bytes);
  payments_.clear();
}

bool TWReportingSession::completePacked(TWReportingSessionMessage& message) const {
  const Shape* shape = message.message.shape();
  // A shape of another client does not know these keys.
  if (shape == nullptr || shapes_ == nullptr || !shapes_->owns(*shape) || shape->hasKeyWithSpace())
    return false;
  if (const auto replaced = replacedDate(knownValue(message.message, KnownKey::kTimestamp))) {
    const Value now = replaced->now;
    if (!message.message.setPacked({{TWReportingInternalEventInvalidTimestamp, replaced->invalid},
                                    {TWReportingInternalEventEpochTime, now}},
                                   *shapes_)) {
      return false;
    }
    shape = message.message.shape();
  }
  const std::lock_guard lock(message);
  const ValueView name = knownValue(message.message, KnownKey::kApplicationName);
  const bool isNamed = name && !(name == ValueView(kUnknownName));
  const Shape* complete =
      shapes_->completed(*shape, message.category, message.type, isNamed ? nullptr : &applicationName_);
  return complete != nullptr && message.message.extend(*complete);
}

void TWReportingSession::addMissingDates(TWReportingSessionMessage& message) {
  const auto replaced = replacedDate(message.message.view(TWReportingInternalEventEpochTime));
  if (!replaced) return;
  const Value invalid = replaced->invalid.value();
  message.message.set(TWReportingInternalEventInvalidTimestamp, invalid);
  message.message.set(TWReportingInternalEventEpochTime, replaced->now);
}

void TWReportingSession::removeWhiteSpaceFromKeys(TWReportingSessionMessage& message) {
  std::vector<ValueMap::Entry> spaced;
  message.message.forEach([&spaced](const SharedString& key, ValueView value) {
    if (key.view().find(' ') != std::string_view::npos) spaced.push_back({key, value.value()});
  });
  for (const ValueMap::Entry& entry : spaced) {
    std::string repaired = entry.key.string();
    std::replace(repaired.begin(), repaired.end(), ' ', '_');
    message.message.set(repaired, entry.value);
  }
  for (const ValueMap::Entry& entry : spaced) message.message.erase(entry.key);
}

void TWReportingSession::addAudioMessageTag(TWReportingSessionMessage& message) {
  message.message.set(TWReportingInternalEventAudioTag,
                      TWReportingContext::current().names().audioTag(message.category, message.type));
}

void TWReportingSession::addAppName(TWReportingSessionMessage& message) const {
  assert(TWReportingUtilityIsOnReportingServerQueue());
  const std::lock_guard lock(message);
  const ValueView name = message.message.view(TWReportingApplicationName);
  if (name && !(name == ValueView(kUnknownName))) return;
  message.message.set(TWReportingApplicationName, applicationName_);
}

bool TWReportingSession::messageIsRedundant(const TWReportingSessionMessage& message) const {
  assert(TWReportingUtilityIsOnReportingServerQueue());
  if (message.type == kTypeError || message.category == kCategoryError) return false;
  const TWReportingSessionMessage* earlier = newest_.find({message.category, message.type});
  if (earlier == nullptr) return false;
  const bool isRepeated = message.message.equalsIgnoring(
      earlier->message, {TWReportingInternalEventProcessUptimeMS, TWReportingInternalEventSystemUptimeSec,
                         TWReportingInternalEventEpochTime});
  if (isRepeated) debugLog(TWReportingSessionCategory(), "marking event redundant");
  return isRepeated;
}

const std::vector<const TWReportingSessionWorkerClass*>& TWReportingSession::getAllWorkerClasses() {
  return TWReportingContext::current().workerRegistry().allClasses();
}

std::optional<std::string> TWReportingSession::clientProcessName() const {
  const MutexLock lock(propertiesMutex_);
  return clientProcessName_;
}

void TWReportingSession::setClientProcessName(std::optional<std::string> name) {
  assert(TWReportingUtilityIsOnReportingServerQueue());
  const MutexLock lock(propertiesMutex_);
  clientProcessName_ = std::move(name);
}

ValueMap TWReportingSession::configuration() const {
  const MutexLock lock(propertiesMutex_);
  return configuration_;
}

ValueMap TWReportingSession::previousValues() const {
  const MutexLock lock(propertiesMutex_);
  return previousValues_.merged();
}

std::string TWReportingSession::previousText(std::string_view key) const {
  const MutexLock lock(propertiesMutex_);
  return previousValues_.latestText(key);
}

void TWReportingSession::addPreviousValues(const ValueMap& values) {
  assert(TWReportingUtilityIsOnReportingServerQueue());
  {
    const MutexLock lock(propertiesMutex_);
    if (previousValues_.add(values, *budget_)) return;
  }
  logFullBudgetOnce(*budget_);
}

void TWReportingSession::takePreviousValuesOf(const TWReportingSession& other) {
  assert(TWReportingUtilityIsOnReportingServerQueue());
  PreviousValues values;
  {
    const MutexLock lock(other.propertiesMutex_);
    values = other.previousValues_;
  }
  const MutexLock lock(propertiesMutex_);
  budget_->give(previousValues_.bytes());
  previousValues_ = std::move(values);
  [[maybe_unused]] const bool fits = budget_->take(previousValues_.bytes());
  assert(fits);
}

std::size_t TWReportingSession::workerInstanceCount() const {
  const MutexLock lock(propertiesMutex_);
  return workers_.size();
}

TWReportingSession::Workers TWReportingSession::messageWorkers() const {
  Workers workers;
  const MutexLock lock(propertiesMutex_);
  for (const MadeWorker& made : workers_) workers.push_back(made.worker);
  return workers;
}

TWReportingSession::Workers TWReportingSession::consumingMessageWorkers() const {
  return workersWith(&TWReportingSessionWorkerClass::isConsumer);
}

TWReportingSession::Workers TWReportingSession::producingMessageWorkers() const {
  return workersWith(&TWReportingSessionWorkerClass::isProducer);
}

TWReportingSession::Workers TWReportingSession::workersWith(bool TWReportingSessionWorkerClass::*role) const {
  Workers workers;
  const MutexLock lock(propertiesMutex_);
  for (const MadeWorker& made : workers_) {
    if (made.workerClass->*role) workers.push_back(made.worker);
  }
  return workers;
}

std::vector<const TWReportingSessionWorkerClass*> TWReportingSession::initializedWorkerClasses() const {
  std::vector<const TWReportingSessionWorkerClass*> classes;
  const MutexLock lock(propertiesMutex_);
  for (const MadeWorker& made : workers_) classes.push_back(made.workerClass);
  return classes;
}

std::string TWReportingSession::description() const {
  assert(TWReportingUtilityIsOnReportingServerQueue());
  const Value* noName = nullptr;
  const std::optional<std::string> clientName = clientProcessName();
  const std::int32_t ownerPid = processIdentifiers_.empty() ? 0 : processIdentifiers_.front();
  return "reporterID=" + std::to_string(reporterID_) + ",serviceName=" + serviceName_ +
         ",ownerPid=" + std::to_string(ownerPid) +
         ",clientProcessName=" + clientName.value_or(textOf(noName)) +
         ",HostApplicationDisplayID=" + TWReportingUtilityRetrieveAppName(configuration()).string() +
         ",started=" + std::to_string(started_ ? 1 : 0) +
         ",singleMessageSession=" + std::to_string(isSingleMessageSession_ ? 1 : 0);
}

}  // namespace tonewerk
