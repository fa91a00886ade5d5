// SPDX-License-Identifier: Apache-2.0
//
// Kills the daemon at random moments, many times, while clients report. Then looks for everything that was
// answered. TONEWERK_TORTURE_KILLS and TONEWERK_TORTURE_SEED say how often, and where the moments come from.
#include <algorithm>
#include <chrono>
#include <cstdlib>
#include <filesystem>
#include <iostream>
#include <map>
#include <memory>
#include <nlohmann/json.hpp>
#include <random>
#include <set>
#include <string>
#include <thread>
#include <unistd.h>
#include <utility>
#include <vector>

#include "platform/linux/dbus/PrivateBus.h"
#include "support/OtherUser.h"
#include "support/users/UserIdentity.h"
#include "system/memory/Sanitizers.h"
#include "system/support/DaemonTest.h"
#include "system/support/RecordedEvents.h"
#include "system/torture/TortureLedger.h"
#include "system/torture/TortureLinks.h"
#include "system/torture/TorturedClient.h"

namespace tonewerk {
namespace {

namespace fs = std::filesystem;
using std::chrono::milliseconds;

// A daemon with a sanitizer takes long for everything.
constexpr unsigned kLongestLife = kHasSanitizer ? 1500 : 150;  // milliseconds
constexpr unsigned kLongestStart = kHasSanitizer ? 500 : 80;   // until it recovers
constexpr unsigned kKillsOfARound = 50;  // a start reads the whole store, and so takes longer with each
constexpr unsigned kRare = 33;           // one life of so many is long
constexpr std::int64_t kPaddingOfALongLife = std::int64_t{14} << 20;  // more than three segments

unsigned numberFrom(const char* variable, unsigned otherwise) {
  const char* text = std::getenv(variable);
  return text == nullptr ? otherwise : static_cast<unsigned>(std::strtoul(text, nullptr, 10));
}

class TortureTest : public DaemonTest {
 protected:
  TortureTest() {
    const bool isRoot = ::geteuid() == 0;
    // All clients of one user are either those of sessions or those of single messages, which otherwise go to
    // the sessions. So without the right to become others there are single messages in some lives only.
    sessionUsers = isRoot ? std::vector<std::uint32_t>{::geteuid(), ::geteuid(), kBob}
                          : std::vector<std::uint32_t>{::geteuid(), ::geteuid(), ::geteuid()};
    if (isRoot) {
      singleUsers = {kAlice, kAlice};
      const std::string address = bus.address();
      openToAllUsers(address.substr(address.find('/')));
    }
    busUser = isRoot ? kOtherUser : ::geteuid();
    daemon.setEnvironment("TONEWERK_LOG", "error");
    daemon.setEnvironment("DBUS_SESSION_BUS_ADDRESS", bus.address());
    daemon.writeConfiguration("preferences/com.orvane.tonewerk.store.toml",
                              "journal_sync_seconds = 1\nmax_megabytes = 4096\n");
  }
  void SetUp() override { ASSERT_TRUE(bus.isRunning()) << "dbus-daemon does not run"; }

  unsigned draw() { return static_cast<unsigned>(random()); }
  unsigned upTo(unsigned most) { return draw() % (most + 1); }
  std::string journalPath(const std::string& name) const {
    return daemon.path(DaemonProcess::kState, "journal/" + name);
  }

  void addClient(std::vector<std::thread>& clients, std::unique_ptr<TortureLink> link, std::uint32_t user,
                 TorturedClient::Reports reports, TortureLife& life) {
    auto client = std::make_shared<TorturedClient>(std::move(link), user, reports, ledger, life, draw());
    clients.emplace_back([client] { client->run(); });
  }
  std::vector<std::thread> startClients(TortureLife& life) {
    using Reports = TorturedClient::Reports;
    std::vector<std::thread> clients;
    const bool hasSessions = draw() % 5 != 0 || life.isLong;
    const Reports mostly = hasSessions ? Reports::kSessions : Reports::kSingles;
    const auto add = [&](std::uint32_t user, Reports reports) {
      addClient(clients, std::make_unique<SocketLink>(daemon.socketPath(), user), user, reports, life);
    };
    for (const std::uint32_t user : sessionUsers) add(user, mostly);
    for (const std::uint32_t user : singleUsers) add(user, Reports::kSingles);
    addClient(clients, std::make_unique<BusLink>(bus.address(), busUser), busUser, mostly, life);
    return clients;
  }

  void kill() {
    daemon.process().kill();
    daemon.process().wait();
  }

  // A daemon that is killed some time after it has recovered and begun to serve. `stay` waits for that time.
  template <typename Stay>
  void serve(TortureLife& life, const Stay& stay) {
    ASSERT_TRUE(daemon.start());
    if (::geteuid() == 0) openToAllUsers(daemon.socketPath());
    std::vector<std::thread> clients = startClients(life);
    EXPECT_TRUE(waitUntil([&] { return life.isServed.load(); }));
    stay();
    kill();
    life.hasEnded = true;
    for (std::thread& client : clients) client.join();
  }

  void liveShort() {
    TortureLife life;
    serve(life, [&] { std::this_thread::sleep_for(milliseconds(upTo(kLongestLife))); });
  }

  // A daemon that fills segments of the journal, and is killed some time after it has dropped the first.
  void liveLong(bool endsSingles) {
    TortureLife life;
    life.isLong = true;
    life.padding = kPaddingOfALongLife;
    life.sendsSingles = endsSingles;
    serve(life, [&] {
      std::string first;
      EXPECT_TRUE(waitUntil([&] { return !(first = oldestSegment()).empty(); }));
      std::this_thread::sleep_for(milliseconds(100));
      // Their session ends 5 s later, and the journal has to keep it until then.
      life.sendsSingles = false;
      const bool isDropped = waitUntil([&] { return !fs::exists(journalPath(first)); });
      EXPECT_TRUE(isDropped) << first << " is kept";
      if (isDropped) ++drops;
      life.sendsSingles = true;
      std::this_thread::sleep_for(milliseconds(upTo(kLongestLife)));
    });
  }
  std::string oldestSegment() const {
    std::string oldest;
    std::error_code none;
    for (const auto& entry : fs::directory_iterator(journalPath(""), none)) {
      const std::string name = entry.path().filename();
      if (name.ends_with(".segment") && (oldest.empty() || name < oldest)) oldest = name;
    }
    return oldest;
  }

  // A daemon that is killed before it serves: at any time, or while it recovers.
  void dieEarly() {
    const std::string first = oldestSegment();
    ASSERT_TRUE(daemon.startWithoutWaiting());
    const auto recovers = [this] { return fs::exists(journalPath("attempts")); };
    if (draw() % 3 == 0) {
      std::this_thread::sleep_for(milliseconds(upTo(kLongestStart)));
    } else {
      // A recovery is over when the segments are gone. There may be none that has to be recovered.
      const auto end = std::chrono::steady_clock::now() + milliseconds(5 * kLongestStart);
      while (!recovers() && oldestSegment() == first && std::chrono::steady_clock::now() < end) {
        std::this_thread::sleep_for(std::chrono::microseconds(200));
      }
      std::this_thread::sleep_for(milliseconds(upTo(5)));
    }
    kill();
    if (recovers()) ++killedRecoveries;
  }

  void torture(unsigned kills) {
    for (unsigned kill = 0; kill < kills && !HasFailure(); ++kill) {
      if (kill % kRare == 5) {
        liveLong(kill % (2 * kRare) == 5);
      } else if (draw() % 4 == 0) {
        dieEarly();
      } else {
        liveShort();
      }
    }
  }

  // Ends in order, and looks at everything that there is now.
  void expectAllReportedOnce() {
    ASSERT_TRUE(daemon.start());
    ASSERT_EQ(daemon.stop(), 0);
    const TortureLedger::Answered answered = ledger.answered();
    const RecordedEvents events(daemon.storePath());
    EXPECT_EQ(events.integrity(), "ok");
    expectMessagesOnce(answered, events);
    expectSummariesOnce(answered, events);
    expectFilesOnce(answered);
    EXPECT_EQ(daemon.log(), "");
    count(answered);
  }

  void expectMessagesOnce(const TortureLedger::Answered& answered, const RecordedEvents& events) const {
    std::map<int, int> rows;
    for (const std::string& row : events.texts("SELECT max(copies) || ' ' || number FROM ("
                                               " SELECT payload ->> 'number' AS number, count(*) AS copies"
                                               " FROM analytics_event WHERE number IS NOT NULL"
                                               " GROUP BY number, name) GROUP BY number")) {
      const std::size_t space = row.find(' ');
      rows[std::stoi(row.substr(space + 1))] = std::stoi(row.substr(0, space));
    }
    for (const auto& [number, message] : answered.messages) {
      EXPECT_TRUE(rows.contains(number)) << "message " << number << " of user " << message.user
                                         << (message.isSingle ? ", without a session," : "") << " is lost";
    }
    for (const auto& [number, copies] : rows) EXPECT_EQ(copies, 1) << "message " << number;

    for (const std::string& row :
         events.texts("SELECT payload ->> 'number' || ' ' || user_id"
                      " FROM analytics_row WHERE payload ->> 'number' IS NOT NULL")) {
      const std::size_t space = row.find(' ');
      const auto message = answered.messages.find(std::stoi(row.substr(0, space)));
      if (message == answered.messages.end()) continue;
      EXPECT_EQ(row.substr(space + 1), std::to_string(message->second.user)) << "message " << message->first;
    }
  }

  static void expectSummariesOnce(const TortureLedger::Answered& answered, const RecordedEvents& events) {
    std::map<std::string, int> summaries;
    for (const std::string& name :
         events.texts("SELECT payload ->> 'HostApplicationDisplayID' FROM analytics_event WHERE name = ?",
                      "com.orvane.longformaudio.Volume.Summary")) {
      ++summaries[name];
    }
    for (const ReporterID session : answered.played) {
      EXPECT_EQ(summaries["torture." + std::to_string(session)], 2) << "session " << session;
    }
    for (const auto& [name, count] : summaries) EXPECT_LE(count, 2) << name;
  }

  void expectFilesOnce(const TortureLedger::Answered& answered) const {
    std::map<ReporterID, std::multiset<int>> found;
    std::error_code none;
    for (const auto& entry : fs::recursive_directory_iterator(daemon.path(DaemonProcess::kLogs), none)) {
      if (entry.path().extension() != ".json") continue;
      // The name has the date, the time and the session in front.
      const std::string name = entry.path().filename();
      std::size_t from = name.find('-', name.find('-') + 1) + 1;
      const auto session = static_cast<ReporterID>(std::stoll(name.substr(from)));
      const auto written = nlohmann::json::parse(textOfFile(entry.path()), nullptr, false);
      EXPECT_TRUE(written.is_array()) << name << " is not whole";
      for (const auto& message : written) {
        const auto number = message.begin()->find("number");
        if (number != message.begin()->end()) found[session].insert(number->get<int>());
      }
    }
    for (const auto& [session, numbers] : answered.filed) {
      for (const int number : numbers) {
        EXPECT_EQ(found[session].count(number), 1U) << "message " << number << " in a file of " << session;
      }
    }
    for (const auto& [session, numbers] : found) {
      EXPECT_EQ(numbers.size(), std::set<int>(numbers.begin(), numbers.end()).size())
          << "files of " << session;
    }
  }

  void count(const TortureLedger::Answered& answered) {
    messages += answered.messages.size();
    played += answered.played.size();
    filed += answered.filed.size();
    for (const auto& [number, message] : answered.messages) {
      ++messagesOf[message.user];
      if (message.isSingle) ++singles;
    }
  }

  // The next round begins with nothing.
  void forget() {
    for (const char* directory : {DaemonProcess::kState, DaemonProcess::kLogs}) {
      for (const auto& entry : fs::directory_iterator(daemon.path(directory))) fs::remove_all(entry.path());
    }
    ledger.clear();
  }

  const unsigned seed = numberFrom("TONEWERK_TORTURE_SEED", std::random_device()());
  std::minstd_rand random{seed};
  PrivateBus bus{"<policy context=\"default\"><allow user=\"*\"/></policy>"};
  std::vector<std::uint32_t> sessionUsers;  // of each client over the socket
  std::vector<std::uint32_t> singleUsers;
  std::uint32_t busUser = 0;
  TortureLedger ledger;

  unsigned killedRecoveries = 0;
  unsigned drops = 0;
  std::size_t messages = 0;
  std::size_t singles = 0;
  std::size_t played = 0;
  std::size_t filed = 0;
  std::map<std::uint32_t, std::size_t> messagesOf;  // by user
};

TEST_F(TortureTest, WhatWasAnsweredIsReportedOnceHoweverOftenTheDaemonIsKilled) {
  const unsigned kills = numberFrom("TONEWERK_TORTURE_KILLS", kHasSanitizer ? 10 : 200);
  SCOPED_TRACE("seed " + std::to_string(seed));
  std::cout << kills << " kills, seed " << seed << std::endl;
  for (unsigned done = 0; done < kills && !HasFailure(); done += kKillsOfARound) {
    torture(std::min(kills - done, kKillsOfARound));
    if (HasFatalFailure()) return;
    expectAllReportedOnce();
    if (HasFailure()) return;
    forget();
  }
  std::cout << "answered: " << messages << " messages, " << singles << " of them without a session, "
            << played << " sessions played, " << filed << " that became files\n"
            << "killed while it recovered: " << killedRecoveries
            << ", after it had dropped segments: " << drops << "\n";
  for (const auto& [user, count] : messagesOf) std::cout << "user " << user << ": " << count << "\n";
  EXPECT_GT(played, 0U);
}

}  // namespace
}  // namespace tonewerk
