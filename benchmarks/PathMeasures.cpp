// SPDX-License-Identifier: Apache-2.0
#include "PathMeasures.h"

#include <algorithm>
#include <chrono>
#include <cstdint>
#include <stdexcept>
#include <thread>
#include <utility>

#include "ClientMessages.h"
#include "FollowerProcess.h"
#include "IngestClients.h"
#include "JournalMessages.h"
#include "JournalProcess.h"
#include "MeasuredDaemon.h"
#include "MessageLoad.h"
#include "RoundTrips.h"
#include "UnusualMessages.h"

namespace tonewerk {
namespace {

using Pace = IngestClients::Pace;
using Seconds = std::chrono::duration<double>;
using Microseconds = std::chrono::duration<double, std::micro>;

constexpr Pace kWriteEach{256, 1};
constexpr Pace kManyAWrite{256, 64};
constexpr DaemonSettings kRecording{};
constexpr DaemonSettings kNotRecording{.records = false};
constexpr DaemonSettings kKeepingNoRequests{.journalMegabytes = 0};
constexpr DaemonSettings kWritingFiles{.records = false, .writesFiles = true};

// Before a measurement, so that memory and tables that are made once are there.
constexpr std::size_t kWarmUp = 8'000;
// A connection holds at most 4,096 sessions.
constexpr std::size_t kSessionClients = 3;

void warmUp(IngestClients& clients, const MessageLoad& load) {
  clients.send(std::max(kWarmUp / load.clients, std::size_t{1}), load.pace);
}

// Returns microseconds a message.
double costOf(const std::string& program, const DaemonSettings& settings, const MessageLoad& load) {
  MeasuredDaemon daemon(program, settings);
  IngestClients clients(daemon.server().socketPath(), plansOf(load), kMeasuredService);
  warmUp(clients, load);
  const MessageCost cost = measureMessages(daemon.server(), clients, load);
  daemon.checkStore(clients.stored());
  return cost.microseconds;
}

double floorOf(const std::string& program, const MessageLoad& load) {
  ServerProcess server;
  server.start(program, {server.socketPath()});
  IngestClients clients(server.socketPath(), plansOf(load), kMeasuredService);
  warmUp(clients, load);
  return measureMessages(server, clients, load).microseconds;
}

ClientMessagePlan journalPlan() { return {kFirstReporterID, 10, 400}; }

double journalCost(std::size_t messages) {
  const JournalProcess journal;
  const JournalMessages all(journalPlan());
  all.send(journal.socketPath(), kWarmUp);
  journal.server().waitUntilIdle();
  const auto before = journal.server().processorTime();
  all.send(journal.socketPath(), messages);
  journal.server().waitUntilIdle();
  const Microseconds time = journal.server().processorTime() - before;
  followJournal(journal.filesDirectory(), kWarmUp + messages);
  return time.count() / static_cast<double>(messages);
}

// Runs `send` until the reader has read everything, and returns messages a second.
double followedRate(std::size_t messages, const std::function<void()>& follow,
                    const std::function<void()>& send) {
  FollowerProcess reader(follow);
  const auto start = std::chrono::steady_clock::now();
  send();
  reader.join();
  return static_cast<double>(messages) / Seconds(std::chrono::steady_clock::now() - start).count();
}

double followedDaemon(const std::string& program, const MessageLoad& load) {
  MeasuredDaemon daemon(program, kRecording);
  std::vector<IngestClientPlan> plans = plansOf(load);
  const IngestMessages& messages = plans.front().messages;
  const std::size_t stored = messages.storedOfFirst(messages.count()) * (load.messages / messages.count());
  IngestClients clients(daemon.server().socketPath(), std::move(plans), kMeasuredService);
  return followedRate(
      load.messages, [&] { followStore(daemon.storePath(), stored * MeasuredDaemon::kRowsAnEvent); },
      [&] { clients.send(load.messages, load.pace); });
}

double followedJournal(std::size_t messages) {
  const JournalProcess journal;
  const JournalMessages all(journalPlan());
  return followedRate(
      messages, [&] { followJournal(journal.filesDirectory(), messages); },
      [&] { all.send(journal.socketPath(), messages); });
}

double memoryAMessage(const std::string& program, const MessageLoad& load) {
  MeasuredDaemon daemon(program, kNotRecording);
  std::vector<IngestClientPlan> plans = plansOf(load);
  const double wireBytes = plans.front().messages.bytesAMessage();
  IngestClients clients(daemon.server().socketPath(), std::move(plans), kMeasuredService);
  warmUp(clients, load);
  daemon.server().waitUntilIdle();
  const std::size_t before = daemon.server().residentMemory();
  const MessageCost cost = measureMessages(daemon.server(), clients, load);
  const std::size_t after = daemon.server().residentMemory();
  return static_cast<double>(after - before) / static_cast<double>(cost.messages) / wireBytes;
}

// Fills the client's budget, or sends as many messages as a short run may. Stops, and returns resident memory
// 5 s later over that of the idle daemon.
double memoryAfterLargest(const std::string& program, const PathEffort& effort) {
  constexpr std::size_t kStep = 500'000;
  constexpr std::size_t kStepKeeps = std::size_t{4} << 20;  // bytes at least, as long as there is room
  constexpr std::size_t kMost = 16'000'000;
  constexpr std::chrono::seconds kPause{5};
  MeasuredDaemon daemon(program, kNotRecording);
  const std::size_t idle = daemon.server().residentMemory();
  const MessageLoad load{.sessions = 1, .pace = kManyAWrite, .allChange = true};
  IngestClients clients(daemon.server().socketPath(), plansOf(load), kMeasuredService);
  // The daemon's line about it may be one of those that are held back, since each message writes one.
  bool isFull = false;
  for (std::size_t before = idle; !isFull && clients.stored() < effort.of(kMost);) {
    clients.send(effort.of(kStep), load.pace);
    const std::size_t now = daemon.server().residentMemory();
    isFull = now < before + effort.of(kStepKeeps);
    before = now;
  }
  if (effort.divisor == 1 && !isFull) throw std::runtime_error("the client's budget does not get full");
  clients.stop();
  std::this_thread::sleep_for(kPause);
  return static_cast<double>(daemon.server().residentMemory()) / static_cast<double>(idle);
}

// Returns microseconds a stored message.
double stopCost(const std::string& program, const DaemonSettings& settings, const MessageLoad& load) {
  MeasuredDaemon daemon(program, settings);
  IngestClients clients(daemon.server().socketPath(), plansOf(load), kMeasuredService);
  clients.send(load.messages, load.pace);
  daemon.server().waitUntilIdle();
  const auto before = daemon.server().processorTime();
  clients.stop();
  daemon.server().waitUntilIdle();
  const Microseconds time = daemon.server().processorTime() - before;
  if (daemon.files() != (settings.writesFiles ? load.sessions : 0)) {
    throw std::runtime_error("the sessions have " + std::to_string(daemon.files()) + " summary files");
  }
  return time.count() / static_cast<double>(clients.stored());
}

// Returns seconds from the crash until the next daemon has reported all sessions and answers.
double recoveryTime(const std::string& program, const MessageLoad& load) {
  constexpr std::size_t kEnough = 4'096;
  MeasuredDaemon daemon(program, {.journalMegabytes = kEnough});
  IngestClients clients(daemon.server().socketPath(), plansOf(load), kMeasuredService);
  clients.send(load.messages / load.clients + 1, load.pace);
  const auto begin = std::chrono::steady_clock::now();
  daemon.server().crash(program);
  const IngestClients next(daemon.server().socketPath(), plansOf({.sessions = 1}), kMeasuredService);
  const Seconds time = std::chrono::steady_clock::now() - begin;
  const std::string clientsRecovered = "sessions of " + std::to_string(load.clients) + " clients recovered";
  if (daemon.server().output().find(clientsRecovered) == std::string::npos) {
    throw std::runtime_error("the sessions are not recovered:\n" + daemon.server().output());
  }
  return time.count();
}

double roundTrip99(const std::string& program, std::size_t messages) {
  const MeasuredDaemon daemon(program, kRecording);
  const std::vector<IngestClientPlan> plans = plansOf({});
  const Latencies latencies = measureRoundTrips(daemon.server().socketPath(), plans.front(), messages);
  return static_cast<double>(latencies.within(0.99)) / 1e6;
}

double unusualCost(const std::string& program, UnusualForm form, std::size_t messages,
                   std::size_t different) {
  MeasuredDaemon daemon(program, kNotRecording);
  std::vector<IngestClientPlan> plans{
      {kFirstReporterID, 1, unusualMessages(form, kFirstReporterID, different)}};
  IngestClients clients(daemon.server().socketPath(), std::move(plans), kMeasuredService);
  const MessageLoad load{.sessions = 1, .pace = {64, 1}, .messages = messages};
  const double cost = measureMessages(daemon.server(), clients, load).microseconds;
  daemon.checkStore(clients.stored());
  return cost;
}

double sessionCost(const std::string& program, std::size_t sessions) {
  const MeasuredDaemon daemon(program, kNotRecording);
  std::vector<IngestClientPlan> plans{
      {kFirstReporterID, 0, IngestMessages::lives(kFirstReporterID, 1'000, kMeasuredService)}};
  IngestClients clients(daemon.server().socketPath(), std::move(plans), kMeasuredService);
  const MessageLoad load{.sessions = 0, .pace = {64, 16}, .messages = sessions};
  clients.send(1'000, load.pace);
  return measureMessages(daemon.server(), clients, load).microseconds;
}

void addThroughput(std::vector<PathMeasure>& all, const PathEffort& effort, const std::string& floor) {
  const MessageLoad each{.pace = kWriteEach, .messages = effort.of(200'000)};
  const MessageLoad many{.pace = kManyAWrite, .messages = effort.of(400'000)};
  for (const auto& [key, what, aim, load] :
       {std::tuple{"off_write_each", "recording off, a write each, over the floor", 1.5, each},
        std::tuple{"off_64_a_write", "recording off, 64 a write, over the floor", 2.0, many}}) {
    all.push_back({key, what, "", aim,
                   [load = load](const std::string& daemon) { return costOf(daemon, kNotRecording, load); },
                   [load = load, floor] { return floorOf(floor, load); }});
  }
}

void addJournal(std::vector<PathMeasure>& all, const PathEffort& effort) {
  const MessageLoad each{.pace = kWriteEach, .messages = effort.of(200'000)};
  all.push_back({"on_write_each_us", "recording on, a write each", "us", 0,
                 [each](const std::string& daemon) { return costOf(daemon, kRecording, each); }, nullptr});
  const MessageLoad many{.pace = kManyAWrite, .messages = effort.of(200'000)};
  for (const auto& [key, what, aim, load] :
       {std::tuple{"kept_us", "recording on, 64 a write, what keeping requests adds", 0.15, many},
        std::tuple{"kept_write_each_us", "the same, a write each", 0.0, each}}) {
    all.push_back({key, what, "us", aim,
                   [load = load](const std::string& daemon) {
                     return costOf(daemon, kRecording, load) - costOf(daemon, kKeepingNoRequests, load);
                   },
                   nullptr});
  }
  const std::string problem = JournalProcess::problem();
  const std::size_t entries = effort.of(50'000);
  all.push_back({"on_over_journal", "recording on, a write each, over the journal", "", 0.17,
                 [entries](const std::string& daemon) {
                   return costOf(daemon, kRecording, {.pace = kWriteEach, .messages = entries});
                 },
                 [entries] { return journalCost(entries); }, false, problem});
  for (const auto& [key, what, aim, pace] :
       {std::tuple{"rate_over_journal", "messages/s with a reader, 64 a write, over the journal", 6.0,
                   kManyAWrite},
        std::tuple{"rate_write_each_over_journal", "the same, a write each", 0.0, kWriteEach}}) {
    const MessageLoad load{.pace = pace, .messages = effort.of(300'000) / 4'000 * 4'000};
    all.push_back({key, what, "", aim,
                   [load](const std::string& daemon) { return followedDaemon(daemon, load); },
                   [entries] { return followedJournal(entries); }, true, problem});
  }
}

void addGrowth(std::vector<PathMeasure>& all, const PathEffort& effort) {
  const std::size_t messages = effort.of(200'000);
  const MessageLoad few{.clients = kSessionClients, .sessions = 10, .pace = kWriteEach, .messages = messages};
  MessageLoad many = few;
  many.sessions = 10'000;
  all.push_back({"sessions_10000", "10,000 sessions over 10, a write each", "", 1.4,
                 [few, many](const std::string& daemon) {
                   return costOf(daemon, kNotRecording, many) / costOf(daemon, kNotRecording, few);
                 },
                 nullptr});
  const MessageLoad one{.clients = 1, .sessions = 1, .pace = kManyAWrite, .messages = messages};
  MessageLoad thousand = one;
  thousand.clients = thousand.sessions = 1'000;
  all.push_back({"clients_1000", "1,000 clients over 1, 64 a write", "", 1.3,
                 [one, thousand](const std::string& daemon) {
                   return costOf(daemon, kNotRecording, thousand) / costOf(daemon, kNotRecording, one);
                 },
                 nullptr});
}

void addMemoryAndStop(std::vector<PathMeasure>& all, const PathEffort& effort) {
  const MessageLoad load{.pace = kManyAWrite, .messages = effort.of(200'000), .allChange = true};
  all.push_back({"stored_over_wire", "memory of a stored message over its bytes", "", 0.6,
                 [load](const std::string& daemon) { return memoryAMessage(daemon, load); }, nullptr});
  all.push_back({"memory_after_largest", "memory 5 s after the largest session, over idle", "", 1.3,
                 [effort](const std::string& daemon) { return memoryAfterLargest(daemon, effort); },
                 nullptr});
  all.push_back({"stop_us", "stop, a stored message", "us", 0.3,
                 [load](const std::string& daemon) { return stopCost(daemon, kNotRecording, load); },
                 nullptr});
  all.push_back({"stop_with_file_us", "stop with summary file, a stored message", "us", 0.7,
                 [load](const std::string& daemon) { return stopCost(daemon, kWritingFiles, load); },
                 nullptr});
}

void addRecovery(std::vector<PathMeasure>& all, const PathEffort& effort) {
  const MessageLoad load{.clients = kSessionClients,
                         .sessions = effort.of(10'000),
                         .pace = kManyAWrite,
                         .messages = effort.of(1'000'000)};
  all.push_back({"recovery_s", "after a crash with 10,000 sessions, 1,000,000 messages", "s", 0,
                 [load](const std::string& daemon) { return recoveryTime(daemon, load); }, nullptr});
}

void addSingle(std::vector<PathMeasure>& all, const PathEffort& effort) {
  all.push_back(
      {"round_trip_p99_ms", "round trip in a flood, 99th percentile", "ms", 0.3,
       [messages = effort.of(100'000)](const std::string& daemon) { return roundTrip99(daemon, messages); },
       nullptr});
  all.push_back({"keys_512_us", "a message of 512 keys", "us", 4,
                 [messages = effort.of(10'000)](const std::string& daemon) {
                   return unusualCost(daemon, UnusualForm::kWide, messages, 200);
                 },
                 nullptr});
  all.push_back(
      {"session_us", "a session's life without messages", "us", 8,
       [sessions = effort.of(20'000)](const std::string& daemon) { return sessionCost(daemon, sessions); },
       nullptr});
}

void addHostile(std::vector<PathMeasure>& all, const PathEffort& effort) {
  struct Row {
    UnusualForm form;
    const char* key;
    const char* what;
    std::size_t messages;
  };
  for (const Row& row :
       {Row{UnusualForm::kNewKeys, "new_keys_us", "a message with new keys", 40'000},
        Row{UnusualForm::kNewOrders, "new_orders_us", "a message with its keys in a new order", 40'000},
        Row{UnusualForm::kNested, "nested_us", "a message of 30 levels", 40'000},
        Row{UnusualForm::kLarge, "large_us", "a message of 300 KiB", 400}}) {
    const std::size_t messages = effort.of(row.messages);
    // The large ones take much memory, so the same ones are sent repeatedly.
    const std::size_t different = row.form == UnusualForm::kLarge ? 16 : messages;
    all.push_back({row.key, row.what, "us", 0,
                   [row, messages, different](const std::string& daemon) {
                     return unusualCost(daemon, row.form, messages, different);
                   },
                   nullptr});
  }
}

}  // namespace

std::vector<PathMeasure> pathMeasures(const PathEffort& effort, const std::string& floor) {
  std::vector<PathMeasure> all;
  addThroughput(all, effort, floor);
  addJournal(all, effort);
  addGrowth(all, effort);
  addMemoryAndStop(all, effort);
  addRecovery(all, effort);
  addSingle(all, effort);
  addHostile(all, effort);
  return all;
}

}  // namespace tonewerk
