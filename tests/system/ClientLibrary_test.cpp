// SPDX-License-Identifier: Apache-2.0
//
// Tests the client library with the real daemon, which may go away and come back.
#include <condition_variable>
#include <cstdint>
#include <functional>
#include <mutex>
#include <string>
#include <utility>
#include <vector>

#include "client/TestPayload.h"
#include "system/support/DaemonTest.h"
#include "system/support/RecordedEvents.h"
#include "tonewerk/reporting.h"

namespace tonewerk {
namespace {

using nlohmann::json;
using ::testing::ElementsAre;
using ::testing::SizeIs;

constexpr int kPatienceMs = 30'000;
constexpr const char* kEvent = "com.orvane.longformaudio.Playback.Activate";

// Holds one answer, for which another thread can wait.
class OneAnswer {
 public:
  static void take(void* self, const twr_answer* answer) { static_cast<OneAnswer*>(self)->take(*answer); }

  twr_status wait() {
    std::unique_lock lock(mutex_);
    EXPECT_TRUE(changed_.wait_for(lock, kSystemTimeout, [&] { return isThere_; }));
    return status_;
  }
  bool isThere() {
    const std::lock_guard lock(mutex_);
    return isThere_;
  }
  std::uint16_t serviceType() const { return serviceType_; }
  std::int64_t reporterID() const { return reporterID_; }
  const std::vector<std::int64_t>& reporterIDs() const { return reporterIDs_; }

 private:
  void take(const twr_answer& answer) {
    const std::lock_guard lock(mutex_);
    isThere_ = true;
    status_ = answer.status;
    serviceType_ = answer.service_type;
    reporterID_ = answer.reporter_id;
    reporterIDs_.assign(answer.reporter_ids, answer.reporter_ids + answer.reporter_id_count);
    changed_.notify_all();
  }

  std::mutex mutex_;
  std::condition_variable changed_;
  bool isThere_ = false;
  twr_status status_ = TWR_OK;
  std::uint16_t serviceType_ = 0;
  std::int64_t reporterID_ = 0;
  std::vector<std::int64_t> reporterIDs_;
};

class ClientLibraryTest : public DaemonTest {
 protected:
  ClientLibraryTest() {
    const std::string path = daemon.socketPath();
    twr_client_options options{};
    options.size = sizeof(options);
    options.socket_path = path.c_str();
    options.queue_bytes = 4096;
    client = twr_client_create(&options);
  }
  ~ClientLibraryTest() override { twr_client_destroy(client, 0); }

  void makeSession() {
    session = twr_session_create(client, 77);
    ASSERT_NE(session, nullptr);
    EXPECT_EQ(twr_session_set_service_type(session, TWR_SERVICE_LONG_FORM_AUDIO, nullptr, nullptr), TWR_OK);
    TestPayload configuration;
    twr_put_text(configuration.get(), "HostApplicationDisplayID", "com.example.player");
    EXPECT_EQ(twr_session_set_configuration(session, configuration.get(), nullptr, nullptr), TWR_OK);
  }
  twr_status send(std::int64_t number) {
    TestPayload payload;
    twr_put_int(payload.get(), "number", number);
    return twr_session_send(session, TWR_CATEGORY_PLAYBACK, TWR_TYPE_ACTIVATE, payload.get(), nullptr,
                            nullptr);
  }
  bool waitForEvents(std::size_t count) const {
    return waitUntil([&] { return recorded().named(kEvent).size() >= count; });
  }
  RecordedEvents recorded() const { return RecordedEvents(daemon.storePath()); }

  twr_client* client = nullptr;
  twr_session* session = nullptr;
};

TEST_F(ClientLibraryTest, MakesItsSessionsAgainAfterTheDaemonsDeathAndSaysWhatItKept) {
  ASSERT_TRUE(daemon.start());
  makeSession();
  OneAnswer stopped;
  ASSERT_EQ(twr_session_start(session, OneAnswer::take, &stopped), TWR_OK);
  ASSERT_EQ(send(0), TWR_OK);
  ASSERT_TRUE(waitForEvents(1));

  daemon.process().kill();
  twr_client_info info{};
  info.size = sizeof(info);
  ASSERT_TRUE(waitUntil([&] {
    twr_client_get_info(client, &info);
    return info.state == TWR_STATE_WAITING;
  }));
  std::int64_t kept = 0;
  while (send(kept + 1) == TWR_OK) ++kept;
  EXPECT_EQ(send(4711), TWR_FULL);
  ASSERT_GT(kept, 0);

  ASSERT_TRUE(daemon.start());
  ASSERT_TRUE(waitForEvents(1 + static_cast<std::size_t>(kept)));
  ASSERT_EQ(twr_client_flush(client, kPatienceMs), TWR_OK);
  ASSERT_EQ(send(kept + 1), TWR_OK);
  ASSERT_TRUE(waitForEvents(2 + static_cast<std::size_t>(kept)));
  const std::vector<json> events = recorded().named(kEvent);
  ASSERT_EQ(events.size(), 2 + static_cast<std::size_t>(kept));
  for (std::size_t at = 0; at < events.size(); ++at) {
    EXPECT_EQ(events[at].at("number"), at);
    // The event's name shows the service type. That the event exists shows that the session was started.
    EXPECT_EQ(events[at].at("HostApplicationDisplayID"), "com.example.player");
    EXPECT_EQ(events[at].contains("twreporting_dropped"), at + 1 == events.size());
  }
  EXPECT_EQ(events.back().at("twreporting_dropped"), 2);
  EXPECT_FALSE(stopped.isThere());
  EXPECT_EQ(twr_session_stop(session, nullptr, nullptr), TWR_OK);
  EXPECT_EQ(stopped.wait(), TWR_OK);
}

TEST_F(ClientLibraryTest, ReportsThroughADaemonThatComesLater) {
  makeSession();
  twr_session_start(session, nullptr, nullptr);
  ASSERT_EQ(send(1), TWR_OK);
  twr_sender* sender = twr_sender_open(session, 0);
  TestPayload payload;
  twr_put_int(payload.get(), "number", 2);
  ASSERT_EQ(twr_sender_send(sender, TWR_CATEGORY_PLAYBACK, TWR_TYPE_ACTIVATE, payload.get()), TWR_OK);
  ASSERT_TRUE(daemon.start());
  ASSERT_TRUE(waitForEvents(2));
  std::vector<int> numbers;
  for (const json& event : recorded().named(kEvent)) numbers.push_back(event.at("number"));
  EXPECT_THAT(numbers, ElementsAre(1, 2));
}

TEST_F(ClientLibraryTest, AsksWhatCanBeAsked) {
  ASSERT_TRUE(daemon.start());
  makeSession();
  // The daemon answers the request about identifier 0 twice; the second answer belongs to no request.
  OneAnswer nothing;
  OneAnswer type;
  OneAnswer valid;
  OneAnswer invalid;
  OneAnswer all;
  OneAnswer unknown;
  ASSERT_EQ(twr_client_get_service_type(client, 0, OneAnswer::take, &nothing), TWR_OK);
  ASSERT_EQ(twr_client_get_service_type(client, 77, OneAnswer::take, &type), TWR_OK);
  ASSERT_EQ(twr_client_validate(client, 77, OneAnswer::take, &valid), TWR_OK);
  ASSERT_EQ(twr_client_validate(client, 78, OneAnswer::take, &invalid), TWR_OK);
  ASSERT_EQ(twr_client_get_all_reporters(client, OneAnswer::take, &all), TWR_OK);
  ASSERT_EQ(twr_client_request(client, "noSuchMethod", nullptr, OneAnswer::take, &unknown), TWR_OK);
  // A refused request is answered at once, before earlier requests that are still queued.
  EXPECT_EQ(unknown.wait(), TWR_REFUSED);
  for (OneAnswer* answer : {&nothing, &type, &valid, &invalid, &all}) EXPECT_EQ(answer->wait(), TWR_OK);
  EXPECT_EQ(nothing.serviceType(), TWR_SERVICE_UNKNOWN);
  EXPECT_EQ(type.serviceType(), TWR_SERVICE_LONG_FORM_AUDIO);
  EXPECT_EQ(valid.reporterID(), 77);
  EXPECT_EQ(valid.serviceType(), TWR_SERVICE_LONG_FORM_AUDIO);
  EXPECT_EQ(invalid.reporterID(), 0);
  EXPECT_EQ(invalid.serviceType(), TWR_SERVICE_UNKNOWN);
  EXPECT_THAT(all.reporterIDs(), ElementsAre(77));
}

TEST_F(ClientLibraryTest, IsToldOfARunsEndHoweverItEnds) {
  ASSERT_TRUE(daemon.start());
  makeSession();
  OneAnswer first;
  OneAnswer again;
  OneAnswer byType;
  OneAnswer byDestroy;
  ASSERT_EQ(twr_session_start(session, OneAnswer::take, &first), TWR_OK);
  ASSERT_EQ(twr_session_start(session, OneAnswer::take, &again), TWR_OK);
  ASSERT_EQ(twr_session_stop(session, nullptr, nullptr), TWR_OK);
  EXPECT_EQ(first.wait(), TWR_OK);
  EXPECT_EQ(again.wait(), TWR_OK);
  ASSERT_EQ(twr_session_start(session, OneAnswer::take, &byType), TWR_OK);
  ASSERT_EQ(twr_session_set_service_type(session, TWR_SERVICE_HAPTICS, nullptr, nullptr), TWR_OK);
  EXPECT_EQ(byType.wait(), TWR_OK);
  ASSERT_EQ(twr_session_start(session, OneAnswer::take, &byDestroy), TWR_OK);
  ASSERT_EQ(twr_session_destroy(session, nullptr, nullptr), TWR_OK);
  EXPECT_EQ(byDestroy.wait(), TWR_OK);
}

// A flush does not wait for answers. The end does, because the daemon does not answer a closed connection.
TEST_F(ClientLibraryTest, IsAnsweredBeforeItIsDestroyed) {
  ASSERT_TRUE(daemon.start());
  makeSession();
  OneAnswer stopped;
  OneAnswer sent;
  OneAnswer destroyed;
  OneAnswer asked;
  twr_session_start(session, OneAnswer::take, &stopped);
  TestPayload payload;
  for (int at = 0; at < 3; ++at)
    twr_session_send(session, TWR_CATEGORY_PLAYBACK, TWR_TYPE_ACTIVATE, payload.get(), nullptr, nullptr);
  twr_session_send(session, TWR_CATEGORY_PLAYBACK, TWR_TYPE_START, payload.get(), OneAnswer::take, &sent);
  twr_session_destroy(session, OneAnswer::take, &destroyed);
  twr_client_get_all_reporters(client, OneAnswer::take, &asked);
  EXPECT_EQ(twr_client_flush(client, kPatienceMs), TWR_OK);
  twr_client_destroy(std::exchange(client, nullptr), kPatienceMs);
  for (OneAnswer* answer : {&stopped, &sent, &destroyed, &asked}) {
    ASSERT_TRUE(answer->isThere());
    EXPECT_EQ(answer->wait(), TWR_OK);
  }
}

TEST_F(ClientLibraryTest, SaysThatASessionWasStillStartedAtItsEnd) {
  ASSERT_TRUE(daemon.start());
  makeSession();
  OneAnswer stopped;
  twr_session_start(session, OneAnswer::take, &stopped);
  twr_client_destroy(std::exchange(client, nullptr), kPatienceMs);
  ASSERT_TRUE(stopped.isThere());
  EXPECT_EQ(stopped.wait(), TWR_DESTROYED);
}

TEST_F(ClientLibraryTest, LeavesItsSessionsToTheDaemonToReport) {
  ASSERT_TRUE(daemon.start());
  makeSession();
  twr_session_start(session, nullptr, nullptr);
  send(1);
  twr_client_destroy(std::exchange(client, nullptr), kPatienceMs);
  EXPECT_TRUE(waitUntil(
      [&] { return !recorded().named("com.orvane.longformaudio.Session_Generic.Summary").empty(); }));
  EXPECT_THAT(recorded().named(kEvent), SizeIs(1));
}

TEST_F(ClientLibraryTest, EndsTheDaemon) {
  ASSERT_TRUE(daemon.start());
  OneAnswer killed;
  ASSERT_EQ(twr_client_kill_service(client, OneAnswer::take, &killed), TWR_OK);
  EXPECT_EQ(killed.wait(), TWR_NOT_CONNECTED);
  EXPECT_EQ(daemon.process().wait(), 2);
}

}  // namespace
}  // namespace tonewerk
