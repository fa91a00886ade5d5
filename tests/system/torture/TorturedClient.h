// SPDX-License-Identifier: Apache-2.0
#pragma once

#include <algorithm>
#include <atomic>
#include <chrono>
#include <cstddef>
#include <cstdint>
#include <memory>
#include <random>
#include <string>
#include <thread>
#include <utility>
#include <vector>

#include "protocol/AudioEvent.h"
#include "support/client/ReportingClient.h"
#include "system/torture/TortureLedger.h"
#include "system/torture/TortureLinks.h"
#include "values/Value.h"

namespace tonewerk {

// One life of the daemon, as its clients see it. Any thread.
struct TortureLife {
  // So much a life may add to the journal in configurations that nobody needs.
  std::atomic<std::int64_t> padding = 0;
  std::atomic<bool> isServed = false;     // a client has got an answer
  bool isLong = false;                    // clients take their time, so that the store stays small
  std::atomic<bool> sendsSingles = true;  // those who send messages without a session still do so
  std::atomic<bool> hasEnded = false;
};

// A client that reports until the daemon is killed. It connects as soon as there is a daemon. Sometimes it
// leaves, with sessions that are open, and connects anew.
class TorturedClient {
 public:
  enum class Reports {
    kSessions,
    kSingles,  // without a session
  };

  // The most sessions that it has open at once.
  static constexpr int kCrowd = 300;

  TorturedClient(std::unique_ptr<TortureLink> link, std::uint32_t user, Reports reports,
                 TortureLedger& ledger, TortureLife& life, unsigned seed)
      : link_(std::move(link)), user_(user), reports_(reports), ledger_(ledger), life_(life), random_(seed) {}

  void run() {
    while (!(isThere_ = link_->connect())) {
      if (life_.hasEnded) return;
      pause();
    }
    isThere_ = link_->ask("getAllReporters", {});
    if (isThere_) life_.isServed = true;
    while (isThere_) {
      report();
      if (life_.isLong) pause(kPauseOfALongLife);
    }
  }

 private:
  static constexpr AudioServiceType kLongFormAudio = 7;
  static constexpr AudioEventCategory kPlayback = 4;
  static constexpr int kMessages = 12;  // of a session, beside those that make its two summaries
  static constexpr int kPauseOfALongLife = 10;
  static constexpr std::int64_t kPadding = std::int64_t{128} << 10;

  static std::string nameOf(ReporterID session) { return "torture." + std::to_string(session); }
  static void pause(int milliseconds = 1) {
    std::this_thread::sleep_for(std::chrono::milliseconds(milliseconds));
  }

  bool ask(std::string_view method, const Arguments& arguments) {
    isThere_ = isThere_ && link_->ask(method, arguments);
    return isThere_;
  }
  bool send(ReporterID session, AudioEventType type, const ValueMap& message,
            AudioEventCategory category = kPlayback) {
    return ask("sendMessage", ReportingClient::messageArguments(message, category, type, {session}));
  }
  // A session leaves a trace in the journal alone: its configuration.
  ValueMap configurationOf(ReporterID session) {
    ValueMap configuration{{"HostApplicationDisplayID", nameOf(session)}};
    if (life_.padding.fetch_sub(kPadding) >= kPadding) {
      configuration.set("padding", std::string(static_cast<std::size_t>(kPadding), 'x'));
    }
    return configuration;
  }
  // The messages of a minute at two volumes, that ends now.
  static std::vector<std::pair<AudioEventType, ValueMap>> minute() {
    const double begin =
        std::chrono::duration<double>(std::chrono::system_clock::now().time_since_epoch()).count() - 60.0;
    return {{kTypeStart,
             {{"session_output_running", true},
              {"QMSessionVolume", 0.25},
              {"active_devices", "Speaker"},
              {"twreporting_timestamp", begin}}},
            {kTypeGeneric, {{"QMSessionVolume", 0.75}, {"twreporting_timestamp", begin + 10}}},
            {kTypeStop, {{"session_output_running", false}, {"twreporting_timestamp", begin + 60}}}};
  }

  void report() {
    if (reports_ == Reports::kSingles) return life_.sendsSingles ? sendSingle() : pause();
    const auto draw = random_() % 256;
    if (draw < 1) return leaveCrowd();
    if (draw < 16) return leave();
    return draw < 32 ? file() : play();
  }

  void sendSingle() {
    const int number = ledger_.nextNumber();
    if (ask("sendMessage",
            ReportingClient::messageArguments({{"number", number}}, kCategoryGeneric, kTypeGeneric, {}))) {
      ledger_.message(number, {user_, true});
    }
    pause();
  }

  bool begin(ReporterID session, AudioServiceType service) {
    if (!ask("createReportingSession", {Value(session)})) return false;
    if (!ask("setServiceType", {Value(service), Value(session)})) return false;
    if (!ask("setConfiguration", {Value(configurationOf(session)), Value(session)})) return false;
    link_->notify("startReportingSessionForID", {Value(session)});
    return true;
  }
  void end(ReporterID session) {
    switch (random_() % 3) {
      case 0:
        ask("stopReportingSessionForID", {Value(session)});
        break;
      case 1:
        ask("destroyReportingSession", {Value(session)});
        break;
      default:
        break;  // stays open
    }
  }

  void play() {
    const ReporterID session = ledger_.nextNumber();
    if (!begin(session, kLongFormAudio)) return;
    for (const auto& [type, message] : minute()) {
      if (!send(session, type, message)) return;
    }
    ledger_.played(session);
    for (int message = 0; message < kMessages; ++message) {
      const int number = ledger_.nextNumber();
      if (!send(session, kTypeGeneric, {{"number", number}}, kCategoryGeneric)) return;
      ledger_.message(number, {user_, false});
    }
    end(session);
  }

  // A session that becomes a file.
  void file() {
    const ReporterID session = ledger_.nextNumber();
    if (!begin(session, kServiceTest)) return;
    for (int message = 0; message < kMessages; ++message) {
      const int number = ledger_.nextNumber();
      if (!send(session, kTypeGeneric, {{"number", number}}, kCategoryGeneric)) return;
      ledger_.message(number, {user_, false});
      ledger_.filed(session, number);
    }
    end(session);
  }

  // Sessions that are open end with the connection.
  void leave() { isThere_ = link_->connect(); }

  // Opens many sessions and disconnects.
  void leaveCrowd() {
    struct Guest {
      ReporterID session;
      int number;
      std::size_t answered = 0;  // of its messages
    };
    std::vector<Guest> guests(1 + random_() % kCrowd);
    for (Guest& guest : guests) {
      guest.session = ledger_.nextNumber();
      guest.number = ledger_.nextNumber();
      const Value session(guest.session);
      link_->request("createReportingSession", {session}, [] {});
      link_->request("setServiceType", {Value(kLongFormAudio), session}, [] {});
      link_->request("setConfiguration", {Value(configurationOf(guest.session)), session}, [] {});
      link_->notify("startReportingSessionForID", {session});
      auto messages = minute();
      messages.emplace_back(kTypeGeneric, ValueMap{{"number", guest.number}});
      for (const auto& [type, message] : messages) {
        const AudioEventCategory category = message.contains("number") ? kCategoryGeneric : kPlayback;
        link_->request("sendMessage",
                       ReportingClient::messageArguments(message, category, type, {guest.session}),
                       [this, &guest] {
                         ++guest.answered;
                         if (guest.answered == 3) ledger_.played(guest.session);
                         if (guest.answered == 4) ledger_.message(guest.number, {user_, false});
                       });
      }
    }
    isThere_ = link_->waitForAll();
    if (isThere_) leave();
  }

  const std::unique_ptr<TortureLink> link_;
  const std::uint32_t user_;
  const Reports reports_;
  TortureLedger& ledger_;
  TortureLife& life_;
  std::minstd_rand random_;
  bool isThere_ = false;
};

}  // namespace tonewerk
