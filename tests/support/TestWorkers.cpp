// SPDX-License-Identifier: Apache-2.0
#include "support/TestWorkers.h"

#include <algorithm>
#include <utility>

#include "session/TWReportingSession.h"
#include "session/TWReportingSessionMessage.h"

namespace tonewerk {
namespace {

TestWorkerJournal* currentJournal = nullptr;

void record(std::string_view name, const std::string& what) {
  if (TestWorkerJournal* journal = TestWorkerJournal::current()) journal->add(std::string(name) + " " + what);
}

enum : unsigned { kSingle = 1, kOnInit = 2, kRedundant = 4 };

// A fixed text as a template argument: each name makes its own class.
template <std::size_t N>
struct Name {
  constexpr Name(const char (&text)[N]) { std::copy_n(text, N, characters); }  // NOLINT: implicit by purpose
  constexpr std::string_view view() const { return {characters, N - 1}; }
  char characters[N]{};
};

template <typename Worker>
std::shared_ptr<Worker> makeUnlessFailing(std::string_view name,
                                          const std::shared_ptr<TWReportingSession>& session) {
  const TestWorkerJournal* journal = TestWorkerJournal::current();
  if (journal != nullptr && journal->makingFails(name)) return nullptr;
  auto worker = std::make_shared<Worker>();
  worker->session = session;
  return worker;
}

std::optional<bool> recordStart(std::string_view name) {
  const TestWorkerJournal* journal = TestWorkerJournal::current();
  const bool fails = journal != nullptr && journal->startFails(name);
  record(name, fails ? "failed to start" : "started");
  return !fails;
}

template <Name kName>
class PlainWorker final : public TWReportingSessionWorkerProtocol {
 public:
  static const TWReportingSessionWorkerClass kWorkerClass;
  const TWReportingSessionWorkerClass& workerClass() const override { return kWorkerClass; }
  static std::shared_ptr<PlainWorker> initWithSession(const std::shared_ptr<TWReportingSession>& session) {
    return makeUnlessFailing<PlainWorker>(kName.view(), session);
  }
  std::optional<bool> start() override {
    record(kName.view(), "started");
    return std::nullopt;
  }
  void stop() override { record(kName.view(), "stopped"); }
};
template <Name kName>
const TWReportingSessionWorkerClass PlainWorker<kName>::kWorkerClass =
    workerClassOf<PlainWorker<kName>>(kName.view());

template <Name kName>
class ProducingWorker final : public TWReportingSessionWorkerProducerProtocol {
 public:
  static const TWReportingSessionWorkerClass kWorkerClass;
  const TWReportingSessionWorkerClass& workerClass() const override { return kWorkerClass; }
  static std::shared_ptr<ProducingWorker> initWithSession(
      const std::shared_ptr<TWReportingSession>& session) {
    return makeUnlessFailing<ProducingWorker>(kName.view(), session);
  }
  std::optional<bool> start() override { return recordStart(kName.view()); }
  void stop() override { record(kName.view(), "stopped"); }
};
template <Name kName>
const TWReportingSessionWorkerClass ProducingWorker<kName>::kWorkerClass =
    workerClassOf<ProducingWorker<kName>>(kName.view());

class NoProducer {};

template <Name kName, unsigned kAnswers, typename Producer = NoProducer>
class ConsumingWorker final : public Producer, public TWReportingSessionWorkerConsumerProtocol {
 public:
  static const TWReportingSessionWorkerClass kWorkerClass;
  const TWReportingSessionWorkerClass& workerClass() const override { return kWorkerClass; }
  static constexpr bool startOnInit() { return (kAnswers & kOnInit) != 0; }
  static constexpr bool handleSingleMessageSession() { return (kAnswers & kSingle) != 0; }
  static std::shared_ptr<ConsumingWorker> initWithSession(
      const std::shared_ptr<TWReportingSession>& session) {
    return makeUnlessFailing<ConsumingWorker>(kName.view(), session);
  }
  std::optional<bool> start() override { return recordStart(kName.view()); }
  void stop() override { record(kName.view(), "stopped"); }
  bool handleRedundantMessages() const override { return (kAnswers & kRedundant) != 0; }
  bool handleMessage(const TWReportingSessionMessage& message) override {
    record(kName.view(),
           "got a=" + textOf(message.message.find("a")) + (message.isRedundant ? " redundant" : ""));
    return false;
  }
};
template <Name kName, unsigned kAnswers, typename Producer>
const TWReportingSessionWorkerClass ConsumingWorker<kName, kAnswers, Producer>::kWorkerClass =
    workerClassOf<ConsumingWorker<kName, kAnswers, Producer>>(kName.view());

}  // namespace

TestWorkerJournal::TestWorkerJournal() { currentJournal = this; }
TestWorkerJournal::~TestWorkerJournal() { currentJournal = nullptr; }
TestWorkerJournal* TestWorkerJournal::current() { return currentJournal; }

std::vector<std::string> TestWorkerJournal::take() { return std::exchange(events_, {}); }

void TestWorkerJournal::onEvent(const std::string& event, std::function<void()> action) {
  actions_[event] = std::move(action);
}

void TestWorkerJournal::add(const std::string& event) {
  events_.push_back(event);
  const auto action = actions_.find(event);
  if (action == actions_.end()) return;
  const auto run = std::move(action->second);
  actions_.erase(action);
  run();
}

std::vector<const TWReportingSessionWorkerClass*> testWorkerClasses() {
  return {&PlainWorker<"Trace">::kWorkerClass,
          &ProducingWorker<"Volume">::kWorkerClass,
          &ProducingWorker<"Gather">::kWorkerClass,
          &ConsumingWorker<"Summary", 0, TWReportingSessionWorkerProducerProtocol>::kWorkerClass,
          &ProducingWorker<"Input">::kWorkerClass,
          &ConsumingWorker<"Metricon", kOnInit | kSingle>::kWorkerClass,
          &ConsumingWorker<"Energybook", kOnInit | kSingle>::kWorkerClass,
          &ConsumingWorker<"MemoryLog", kOnInit | kRedundant>::kWorkerClass,
          &ConsumingWorker<"Diagwire", kOnInit | kSingle>::kWorkerClass,
          &ProducingWorker<"DriverSnapshot">::kWorkerClass,
          &ProducingWorker<"SystemMonitor">::kWorkerClass,
          &ConsumingWorker<"Capsa", kSingle | kRedundant>::kWorkerClass,
          &ConsumingWorker<"DP", 0>::kWorkerClass,
          &PlainWorker<"JsonFile">::kWorkerClass,
          &ConsumingWorker<"Rtc", kSingle>::kWorkerClass,
          &ConsumingWorker<"IssueDraft", kSingle>::kWorkerClass};
}

std::vector<const TWReportingSessionWorkerClass*> testWorkerClassesWithoutStartOnInit() {
  auto classes = testWorkerClasses();
  std::erase_if(classes,
                [](const TWReportingSessionWorkerClass* workerClass) { return workerClass->startOnInit; });
  return classes;
}

const TWReportingSessionWorkerClass* testWorkerClass(std::string_view name) {
  for (const TWReportingSessionWorkerClass* workerClass : testWorkerClasses()) {
    if (workerClass->name == name) return workerClass;
  }
  return nullptr;
}

}  // namespace tonewerk
