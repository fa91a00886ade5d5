// SPDX-License-Identifier: Apache-2.0
#include "platform/linux/journal/JournalPlayer.h"

#include <gmock/gmock.h>
#include <memory>
#include <string>
#include <vector>

#include "platform/RequestHandler.h"
#include "platform/accounts/Accounts.h"
#include "platform/accounts/WorkingFor.h"
#include "platform/linux/messagepack/RpcWriter.h"
#include "protocol/Requests.h"
#include "support/manual/ManualClock.h"
#include "support/memory/MemoryJournal.h"

namespace tonewerk {
namespace {

using testing::ElementsAre;
using Kind = Journal::Kind;

// Notes what happens to its connections, with the time and the user for whom the thread works.
class NotingService final : public MessagingListenerDelegate {
 public:
  explicit NotingService(const Clock& clock) : clock_(clock) {}

  bool listenerShouldAcceptNewConnection(MessagingConnection& connection) override {
    const std::string name = connection.processName().value_or("nobody");
    notes.push_back("connect " + name + " of " + std::to_string(connection.userIdentifier()));
    connection.setRequestHandler(requests::all(), std::make_shared<Handler>(*this, name));
    connection.setInterruptionHandler([this, name] { notes.push_back("end " + name); });
    connection.setInvalidationHandler([] {});
    connection.resume();
    return true;
  }

  std::vector<std::string> notes;

 private:
  class Handler final : public RequestHandler {
   public:
    Handler(NotingService& service, std::string name) : service_(service), name_(std::move(name)) {}
    void handleRequest(std::size_t method, Arguments arguments, Reply /*reply*/,
                       InFlightToken /*token*/) override {
      const Account* account = WorkingFor::accountIfAny();
      service_.notes.push_back(name_ + " " + std::string(requests::kAll[method].name) + " " +
                               std::to_string(arguments.size()) + " at " +
                               std::to_string(static_cast<int>(service_.clock_.now())) + " for " +
                               (account == nullptr ? "nobody" : std::to_string(account->user())));
    }

   private:
    NotingService& service_;
    const std::string name_;
  };

  const Clock& clock_;
};

class JournalPlayerTest : public testing::Test {
 protected:
  static std::string frameOf(std::string_view method, const Arguments& arguments) {
    std::string frame;
    RpcWriter(frame).notification(method, arguments);
    return frame;
  }
  void append(Kind kind, double at, std::uint64_t client, const std::string& bytes = "") {
    (void)journal.append(kind, {at, client, 1001}, bytes);
  }
  Journal::Reading play() {
    EXPECT_TRUE(journal.write());
    JournalPlayer player(journal, service, accounts,
                         {.begins = [this](const Journal::Record& record) { begun = record; },
                          .endSingleMessages =
                              [this](std::uint32_t user) {
                                service.notes.push_back("single messages of " + std::to_string(user));
                              },
                          .progress = [](std::uint64_t) {}});
    const Journal::Reading reading = player.play();
    open = player.openClients();
    service.notes.emplace_back("played");
    player.endAll();
    return reading;
  }

  ManualClock real;
  PlayedClock clock{real};
  Accounts accounts{500, real};
  MemoryJournal journal;
  NotingService service{clock};
  Journal::Record begun;
  std::size_t open = 0;
};

TEST_F(JournalPlayerTest, RequestsRunAgainAtTheirTimesForTheirUsers) {
  append(Kind::kConnected, 100, 0, "11 player");
  append(Kind::kRequest, 101, 1, frameOf("createReportingSession", {Value(77)}));
  append(Kind::kRequest, 105, 1, frameOf("setServiceType", {Value(7), Value(77)}));
  EXPECT_EQ(play().records, 3U);
  EXPECT_THAT(service.notes,
              ElementsAre("connect player of 1001", "player createReportingSession 1 at 101 for 1001",
                          "player setServiceType 2 at 105 for 1001", "played", "end player"));
  EXPECT_EQ(open, 1U);
}

TEST_F(JournalPlayerTest, AClientIsKnownByItsFirstRecord) {
  append(Kind::kConnected, 100, 0, "11 player");
  append(Kind::kConnected, 100, 0, "11 recorder");
  append(Kind::kConnected, 101, 1, "11 player");  // again, before another session
  append(Kind::kRequest, 102, 2, frameOf("destroyReportingSession", {Value(7)}));
  append(Kind::kDisconnected, 103, 2);
  play();
  EXPECT_THAT(service.notes, ElementsAre("connect player of 1001", "connect recorder of 1001",
                                         "recorder destroyReportingSession 1 at 102 for 1001", "end recorder",
                                         "played", "end player"));
}

TEST_F(JournalPlayerTest, ItSaysWhichRecordRunsNext) {
  append(Kind::kConnected, 100, 0, "11 player");
  play();
  EXPECT_EQ(begun.sequence, 1U);
  EXPECT_EQ(begun.origin.client, 1U);
}

TEST_F(JournalPlayerTest, TheEndOfSingleMessagesIsPassedOn) {
  append(Kind::kSingleMessagesEnded, 100, 0);
  play();
  EXPECT_THAT(service.notes, ElementsAre("single messages of 1001", "played"));
}

TEST_F(JournalPlayerTest, WhatNobodyAskedForIsLeftOut) {
  append(Kind::kRequest, 100, 9, frameOf("createReportingSession", {Value(77)}));  // no such client
  append(Kind::kConnected, 100, 0, "11 player");
  append(Kind::kRequest, 101, 2, "no frame");
  append(Kind::kRequest, 101, 2, frameOf("noSuchMethod", {}));
  append(Kind::kRequest, 101, 2, frameOf("createReportingSession", {}));
  append(Kind::kDisconnected, 102, 9);
  play();
  EXPECT_THAT(service.notes, ElementsAre("connect player of 1001", "played", "end player"));
}

// The journal has none of these. Each start would end at the first of them, or wait for its answer.
TEST_F(JournalPlayerTest, RequestsThatEndTheProcessOrOnlyLookAreNotPlayed) {
  append(Kind::kConnected, 100, 0, "11 player");
  for (const Method& method : requests::kAll) {
    if (method.parameters.empty()) append(Kind::kRequest, 101, 1, frameOf(method.name, {}));
  }
  append(Kind::kRequest, 102, 1, frameOf("createReportingSession", {Value(77)}));
  play();
  EXPECT_THAT(service.notes,
              ElementsAre("connect player of 1001", "player createReportingSession 1 at 102 for 1001",
                          "played", "end player"));
}

TEST_F(JournalPlayerTest, AnEmptyJournalDoesNothing) {
  EXPECT_EQ(play().records, 0U);
  EXPECT_THAT(service.notes, ElementsAre("played"));
}

}  // namespace
}  // namespace tonewerk
