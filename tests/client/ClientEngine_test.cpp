// SPDX-License-Identifier: Apache-2.0
#include "client/ClientEngine.h"

#include <algorithm>
#include <array>
#include <cerrno>
#include <csignal>
#include <cstdlib>
#include <fcntl.h>
#include <filesystem>
#include <fstream>
#include <gmock/gmock.h>
#include <sys/ioctl.h>
#include <sys/socket.h>
#include <thread>

#include "client/ClientTest.h"

namespace tonewerk {
namespace {

using std::chrono::milliseconds;
using testing::ElementsAre;
using testing::IsEmpty;

using ClientEngineTest = ClientTest;

// The directory in /proc of the client's thread; empty without one.
std::string clientThread() {
  for (const auto& entry : std::filesystem::directory_iterator("/proc/self/task")) {
    std::string name;
    std::getline(std::ifstream(entry.path() / "comm"), name);
    if (name == "tw-reporting") return entry.path();
  }
  return {};
}

std::string statusOfClientThread(const std::string& field) {
  std::ifstream status(clientThread() + "/status");
  for (std::string line; std::getline(status, line);)
    if (line.starts_with(field)) return line.substr(field.size());
  return {};
}

TEST_F(ClientEngineTest, ConnectsWithTheFirstRequest) {
  ClientSettings chosen = settings(path);
  chosen.stateChanged = AnswerLog::noteState;
  chosen.context = &log;
  makeClientWith(chosen);
  const auto connection = connectWithSession();
  EXPECT_EQ(log.next(), "state 1");
  EXPECT_EQ(log.next(), "state 2");
  EXPECT_EQ(info().state, TWR_STATE_CONNECTED);
  EXPECT_EQ(info().socket_path, path);
  EXPECT_EQ(info().connections, 1U);
}

TEST_F(ClientEngineTest, HasAThreadOfItsOwnAsLongAsItLives) {
  connectWithSession();
  EXPECT_NE(clientThread(), "");
  destroyClient();
  EXPECT_EQ(clientThread(), "");
}

TEST_F(ClientEngineTest, LeavesSignalsToTheProgram) {
  connectWithSession();
  const std::string blocked = statusOfClientThread("SigBlk:");
  // All signals except those that cannot be blocked and two that the C library uses.
  const std::uint64_t mask = std::stoull(blocked, nullptr, 16);
  for (const int signal : {SIGTERM, SIGINT, SIGCHLD, SIGUSR1, SIGALRM, SIGPIPE})
    EXPECT_NE(mask >> static_cast<unsigned>(signal - 1) & 1U, 0U) << signal;
  sigset_t mine;
  ::pthread_sigmask(SIG_SETMASK, nullptr, &mine);
  EXPECT_EQ(sigismember(&mine, SIGTERM), 0);
}

TEST_F(ClientEngineTest, TriesItsPathsInOrder) {
  ClientSettings chosen = settings(directory.path("nobody.sock"));
  chosen.socketPaths.push_back(path);
  makeClientWith(chosen);
  EXPECT_NE(connectWithSession(), nullptr);
  EXPECT_EQ(info().socket_path, path);
}

TEST_F(ClientEngineTest, FailsOnAPathThatIsTooLong) {
  makeClientWith(settings(std::string(200, 'x')));
  EXPECT_EQ(twr_client_connect(client, kScriptPatienceMs), TWR_NOT_CONNECTED);
  EXPECT_EQ(info().last_error, ENAMETOOLONG);
}

TEST_F(ClientEngineTest, ConnectsWhenAskedTo) {
  EXPECT_EQ(twr_client_connect(client, kScriptPatienceMs), TWR_OK);
  EXPECT_EQ(twr_client_connect(client, 0), TWR_OK);
  EXPECT_NE(daemon->accept(), nullptr);
}

TEST_F(ClientEngineTest, SaysThatThereIsNoDaemon) {
  daemon.reset();
  ClientSettings chosen = settings(path);
  chosen.firstDelay = chosen.maxDelay = milliseconds(1'000'000);
  makeClientWith(chosen);
  EXPECT_EQ(twr_client_connect(client, kScriptPatienceMs), TWR_NOT_CONNECTED);
  EXPECT_EQ(info().state, TWR_STATE_WAITING);
  EXPECT_EQ(info().last_error, ECONNREFUSED);
  // Each call makes an attempt of its own.
  session = twr_session_create(client, 77);
  EXPECT_EQ(twr_client_flush(client, kScriptPatienceMs), TWR_NOT_CONNECTED);
  daemon = std::make_unique<ScriptedServer>(path);
  EXPECT_EQ(twr_client_flush(client, kScriptPatienceMs), TWR_OK);
  EXPECT_EQ(daemon->accept()->nextText(), "createReportingSession 77");
}

TEST_F(ClientEngineTest, KeepsWhatIsQueuedUntilThereIsADaemon) {
  daemon.reset();
  ClientSettings chosen = settings(path);
  chosen.queueBytes = 2000;
  makeClientWith(chosen);
  const int kept = fillQueue();
  EXPECT_EQ(info().messages_dropped, 2U);
  EXPECT_GT(info().queued_bytes, 0U);
  EXPECT_LE(info().queued_bytes, 2000U);
  EXPECT_EQ(info().messages_sent, 0U);

  daemon = std::make_unique<ScriptedServer>(path);
  const auto connection = daemon->accept();
  EXPECT_EQ(connection->nextText(), "createReportingSession 77");
  for (int at = 0; at < kept; ++at) EXPECT_EQ(connection->nextText(), message(at));
  EXPECT_EQ(twr_client_flush(client, kScriptPatienceMs), TWR_OK);
  EXPECT_EQ(send(5), TWR_OK);
  EXPECT_EQ(connection->nextText(), message(5, ",\"twreporting_dropped\":2"));
  EXPECT_EQ(twr_client_flush(client, kScriptPatienceMs), TWR_OK);
  EXPECT_EQ(info().queued_bytes, 0U);
  EXPECT_EQ(info().messages_sent, static_cast<std::uint64_t>(kept) + 1);
}

TEST_F(ClientEngineTest, MakesItsSessionsAgainWhenTheDaemonComesBack) {
  ClientSettings chosen = settings(path);
  chosen.stateChanged = AnswerLog::noteState;
  chosen.context = &log;
  makeClientWith(chosen);
  auto connection = connectWithSession();
  twr_session_set_service_type(session, TWR_SERVICE_HAPTICS, nullptr, nullptr);
  twr_session_start(session, AnswerLog::note, log.as("stopped"));
  connection->nextTexts(2);
  connection.reset();
  connection = daemon->accept();
  EXPECT_THAT(connection->nextTexts(2), ElementsAre("createReportingSession 77", "setServiceType 3 77"));
  const RpcFrame start = connection->next();
  EXPECT_EQ(textOf(start), "startReportingSessionForID 77 ?");
  EXPECT_EQ(send(1), TWR_OK);
  EXPECT_EQ(connection->nextText(), message(1));
  connection->answer(start.identifier, true);
  std::vector<std::string> all;
  while (all.empty() || all.back() != "stopped: done") all.push_back(log.next());
  EXPECT_THAT(all, ElementsAre("state 1", "state 2", "state 3", "state 1", "state 2", "stopped: done"));
  EXPECT_EQ(info().connections, 2U);
  EXPECT_EQ(info().last_error, ECONNRESET);
}

TEST_F(ClientEngineTest, CallsWaitingRepliesWhenTheConnectionBreaks) {
  auto connection = connectWithSession();
  ASSERT_EQ(send(1, AnswerLog::note, log.as("send")), TWR_OK);
  connection->next();
  connection.reset();
  EXPECT_EQ(log.next(), "send: not connected to the daemon");
  connection = daemon->accept();
  EXPECT_EQ(connection->nextText(), "createReportingSession 77");
  EXPECT_EQ(send(2), TWR_OK);
  EXPECT_EQ(connection->nextText(), message(2));
}

TEST_F(ClientEngineTest, ClosesAConnectionOnInvalidData) {
  const std::vector<std::string> nonsense = {
      "\xFF\xFF\xFF",
      std::string("\x94\x00\x01\xA1m\x90", 6),
      std::string("\x93\x02\xA1m\x90", 5),
      std::string("\x94\x01\x01\xC0\x91\xC0", 6),
      std::string("\x95\x01\x01\xC0\xC0\xC0", 6),
      std::string("\x94\x01\x01\xC0\xDD\xFF\xFF\xFF\xFF", 9) + std::string(2'000'000, '\x01')};
  session = twr_session_create(client, 77);
  for (const std::string& bytes : nonsense) {
    const auto connection = daemon->accept();
    EXPECT_EQ(connection->nextText(), "createReportingSession 77");
    std::string_view left = bytes;
    while (!left.empty()) {
      const ssize_t count = ::send(connection->fileDescriptor(), left.data(), left.size(), MSG_NOSIGNAL);
      if (count <= 0) break;
      left.remove_prefix(static_cast<std::size_t>(count));
    }
    EXPECT_TRUE(connection->waitForEnd());
  }
  const auto connection = daemon->accept();
  EXPECT_EQ(connection->nextText(), "createReportingSession 77");
  EXPECT_EQ(info().last_error, EBADMSG);
}

TEST_F(ClientEngineTest, IgnoresAnAnswerToNoRequest) {
  const auto connection = connectWithSession();
  connection->answer(4711, true);
  EXPECT_EQ(send(1), TWR_OK);
  EXPECT_EQ(connection->nextText(), message(1));
  EXPECT_EQ(info().connections, 1U);
}

TEST_F(ClientEngineTest, WaitsForADaemonThatReadsNothingAndLosesNothing) {
  ClientSettings chosen = settings(path);
  chosen.queueBytes = std::size_t{4} * 1024 * 1024;
  makeClientWith(chosen);
  const auto connection = connectWithSession();
  int sent = 0;
  // More than the sockets' buffers hold.
  for (; sent < 6000; ++sent) ASSERT_EQ(send(sent), TWR_OK);
  EXPECT_EQ(twr_client_flush(client, 1), TWR_TIMED_OUT);
  EXPECT_EQ(twr_client_connect(client, 0), TWR_OK);
  for (int at = 0; at < sent; ++at) ASSERT_EQ(connection->nextText(), message(at));
  EXPECT_EQ(twr_client_flush(client, kScriptPatienceMs), TWR_OK);
}

TEST_F(ClientEngineTest, SendsAgainWhatADaemonThatReadNothingDidNotTake) {
  ClientSettings chosen = settings(path);
  chosen.queueBytes = std::size_t{4} * 1024 * 1024;
  makeClientWith(chosen);
  auto connection = connectWithSession();
  constexpr int kCount = 6000;
  for (int at = 0; at < kCount; ++at) ASSERT_EQ(send(at), TWR_OK);
  EXPECT_EQ(twr_client_flush(client, 1), TWR_TIMED_OUT);
  // Messages in the socket's buffers are lost with the connection. All later ones arrive, each once.
  connection.reset();
  connection = daemon->accept();
  EXPECT_EQ(connection->nextText(), "createReportingSession 77");
  const std::string first = connection->nextText();
  int number = 0;
  while (number < kCount && message(number) != first) ++number;
  ASSERT_LT(number, kCount);
  EXPECT_GT(number, 0);
  for (int at = number + 1; at < kCount; ++at) ASSERT_EQ(connection->nextText(), message(at));
}

TEST_F(ClientEngineTest, TriesAgainAfterEachFailure) {
  daemon.reset();
  ClientSettings chosen = settings(path);
  chosen.stateChanged = AnswerLog::noteState;
  chosen.context = &log;
  makeClientWith(chosen);
  session = twr_session_create(client, 77);
  for (int at = 0; at < 4; ++at) {
    EXPECT_EQ(log.next(), "state 1");
    EXPECT_EQ(log.next(), "state 3");
  }
}

TEST_F(ClientEngineTest, TriesOnceWithTheOptionOnce) {
  daemon.reset();
  ClientSettings chosen = settings(path);
  chosen.isOnce = true;
  makeClientWith(chosen);
  session = twr_session_create(client, 77);
  EXPECT_EQ(twr_client_connect(client, kScriptPatienceMs), TWR_NOT_CONNECTED);
  EXPECT_EQ(info().state, TWR_STATE_ENDED);
  EXPECT_EQ(send(1), TWR_NOT_CONNECTED);
  EXPECT_EQ(twr_session_start(session, nullptr, nullptr), TWR_NOT_CONNECTED);
  EXPECT_EQ(twr_client_get_all_reporters(client, nullptr, nullptr), TWR_NOT_CONNECTED);
  EXPECT_EQ(twr_client_flush(client, kScriptPatienceMs), TWR_OK);  // nothing is left
  twr_sender* sender = twr_sender_open(session, 0);
  twr_sender_close(sender);
  EXPECT_NE(twr_session_create(client, 78), nullptr);
  EXPECT_EQ(twr_session_destroy(session, nullptr, nullptr), TWR_NOT_CONNECTED);
  daemon = std::make_unique<ScriptedServer>(path);
  EXPECT_EQ(twr_client_connect(client, kScriptPatienceMs), TWR_NOT_CONNECTED);
  EXPECT_FALSE(daemon->hasCaller());
}

TEST_F(ClientEngineTest, CallsWaitingRepliesWhenTheOnlyAttemptFails) {
  daemon.reset();
  ClientSettings chosen = settings(path);
  chosen.isOnce = true;
  makeClientWith(chosen);
  if (twr_client_get_all_reporters(client, AnswerLog::note, log.as("all")) == TWR_OK) {
    EXPECT_EQ(log.next(), "all: not connected to the daemon");
  }
}

TEST_F(ClientEngineTest, DoesNotReconnectWithTheOptionOnce) {
  ClientSettings chosen = settings(path);
  chosen.isOnce = true;
  makeClientWith(chosen);
  auto connection = connectWithSession();
  twr_session_start(session, AnswerLog::note, log.as("stopped"));
  connection->next();
  connection.reset();
  EXPECT_EQ(log.next(), "stopped: not connected to the daemon");
  EXPECT_EQ(info().state, TWR_STATE_ENDED);
  EXPECT_FALSE(daemon->hasCaller());
}

TEST_F(ClientEngineTest, SendsEverythingBeforeItIsDestroyed) {
  session = twr_session_create(client, 77);
  for (int at = 0; at < 3; ++at) send(at);
  std::thread destroyer([&] { destroyClient(); });
  auto connection = daemon->accept();
  EXPECT_EQ(connection->nextText(), "createReportingSession 77");
  for (int at = 0; at < 3; ++at) EXPECT_EQ(connection->nextText(), message(at));
  EXPECT_TRUE(connection->waitForEnd());
  connection.reset();
  destroyer.join();
}

TEST_F(ClientEngineTest, DeliversAnswersUntilTheDaemonHasClosedItsEnd) {
  auto connection = connectWithSession();
  twr_session_start(session, AnswerLog::note, log.as("stopped"));
  send(1, AnswerLog::note, log.as("send"));
  connection->next();
  const RpcFrame message = connection->next();
  std::thread destroyer([&] { destroyClient(); });
  connection->answer(message.identifier, std::nullopt);
  EXPECT_TRUE(connection->waitForEnd());
  connection.reset();
  destroyer.join();
  EXPECT_THAT(log.rest(),
              ElementsAre("send: done", "stopped: the client was destroyed before the answer came"));
}

// The daemon does not answer a client that has ended its half of the connection, so the client does that
// last.
TEST_F(ClientEngineTest, IsDestroyedWhenAllRequestsAreAnswered) {
  auto connection = connectWithSession();
  twr_session_start(session, AnswerLog::note, log.as("stopped"));
  twr_session_stop(session, AnswerLog::note, log.as("stop"));
  send(1, AnswerLog::note, log.as("send", [&](const twr_answer&) { send(2); }));
  std::thread destroyer([&] { destroyClient(); });
  const std::uint32_t start = connection->next().identifier;
  const std::uint32_t stop = connection->next().identifier;
  const std::uint32_t message = connection->next().identifier;
  connection->answer(start, Value(true));
  connection->answer(stop, Value(true));
  EXPECT_EQ(log.next(), "stopped: done");
  EXPECT_EQ(log.next(), "stop: done");
  connection->answer(message, std::nullopt);
  // The callback of the last answer can still send a message.
  EXPECT_EQ(connection->nextText(), ClientTest::message(2));
  EXPECT_TRUE(connection->waitForEnd());
  connection.reset();
  destroyer.join();
  EXPECT_THAT(log.rest(), ElementsAre("send: done"));
}

TEST_F(ClientEngineTest, IsDestroyedWithoutAnswersThatADaemonMayHoldBack) {
  auto connection = connectWithSession();
  twr_client_request(client, "watch.nextMessages", nullptr, AnswerLog::note, log.as("watch"));
  std::thread destroyer([&] { destroyClient(); });
  EXPECT_EQ(connection->nextText(), "watch.nextMessages ?");
  EXPECT_TRUE(connection->waitForEnd());
  connection.reset();
  destroyer.join();
  EXPECT_THAT(log.rest(), ElementsAre("watch: the client was destroyed before the answer came"));
}

TEST_F(ClientEngineTest, ReportsAConnectionThatBrokeBeforeTheAnswer) {
  auto connection = connectWithSession();
  send(1, AnswerLog::note, log.as("send"));
  connection->next();
  daemon.reset();
  std::thread destroyer([&] { destroyClient(); });
  connection.reset();
  destroyer.join();
  EXPECT_THAT(log.rest(), ElementsAre("send: not connected to the daemon"));
}

TEST_F(ClientEngineTest, DropsTheRestWhenTheTimeIsUp) {
  auto connection = connectWithSession();
  send(1, AnswerLog::note, log.as("send"));
  connection->next();
  destroyClient(1);
  EXPECT_THAT(log.rest(), ElementsAre("send: the client was destroyed before the answer came"));
  EXPECT_TRUE(connection->waitForEnd());
}

TEST_F(ClientEngineTest, IsDestroyedAtOnceWithoutADaemon) {
  daemon.reset();
  ClientSettings chosen = settings(path);
  chosen.firstDelay = chosen.maxDelay = milliseconds(1'000'000);
  makeClientWith(chosen);
  session = twr_session_create(client, 77);
  twr_session_start(session, AnswerLog::note, log.as("stopped"));
  destroyClient(1'000'000);
  EXPECT_THAT(log.rest(), ElementsAre("stopped: not connected to the daemon"));
}

TEST_F(ClientEngineTest, IsDestroyedWithoutHavingBeenUsed) { destroyClient(1'000'000); }

TEST_F(ClientEngineTest, CarriesAMessageThatIsLargerThanItsQueue) {
  const auto connection = connectWithSession();
  ASSERT_EQ(twr_client_flush(client, kScriptPatienceMs), TWR_OK);
  TestPayload payload(1024 * 1024);
  const std::string text(ClientSettings::kDefaultQueueBytes * 2, 'x');
  ASSERT_EQ(twr_put_text(payload.get(), "text", text.c_str()), TWR_OK);
  EXPECT_EQ(twr_session_send(session, 1, 1, payload.get(), nullptr, nullptr), TWR_OK);
  EXPECT_EQ(connection->nextMap().text("text"), text);
}

// If the delay were not reset, the last of these connections would come after minutes.
TEST_F(ClientEngineTest, ReconnectsSoonToADaemonThatAnswers) {
  ClientSettings chosen = settings(path);
  chosen.maxDelay = milliseconds(1'000'000);
  makeClientWith(chosen);
  for (int at = 0; at < 20; ++at) {
    ASSERT_EQ(twr_client_get_all_reporters(client, AnswerLog::note, log.as("all")), TWR_OK);
    const auto connection = daemon->accept();
    connection->answer(connection->next().identifier, Value(ValueArray()));
    EXPECT_EQ(log.next(), "all: done");
  }
}

TEST_F(ClientEngineTest, LeavesNoDescriptorToProgramsThatAreExecuted) {
  const auto connection = connectWithSession();
  int found = 0;
  for (const auto& entry : std::filesystem::directory_iterator("/proc/self/fd")) {
    const int descriptor = std::stoi(entry.path().filename());
    std::error_code error;
    const std::string target = std::filesystem::read_symlink(entry.path(), error);
    if (!target.starts_with("socket:") && target != "anon_inode:[eventfd]") continue;
    EXPECT_NE(::fcntl(descriptor, F_GETFD) & FD_CLOEXEC, 0) << target;
    ++found;
  }
  EXPECT_GE(found, 4);  // two of the daemon and two of the client
}

TEST_F(ClientEngineTest, ReadsTheEnvironmentOnceWhenItIsCreated) {
  ::setenv("TONEWERK_REPORTING_SOCKET", path.c_str(), 1);
  twr_client* other = twr_client_create(nullptr);
  ::setenv("TONEWERK_REPORTING_SOCKET", "/nowhere", 1);
  EXPECT_EQ(twr_client_connect(other, kScriptPatienceMs), TWR_OK);
  ::unsetenv("TONEWERK_REPORTING_SOCKET");
  twr_client_destroy(other, 0);
}

TEST_F(ClientEngineTest, RaisesNoSignalWhenTheDaemonIsGone) {
  auto connection = connectWithSession();
  connection.reset();
  daemon.reset();
  for (int at = 0; at < 100; ++at) send(at);
  EXPECT_NE(twr_client_flush(client, kScriptPatienceMs), TWR_TIMED_OUT);
}

TEST_F(ClientEngineTest, SendsARealTimeThreadsMessages) {
  const auto connection = connectWithSession();
  twr_session_start(session, nullptr, nullptr);
  twr_sender* sender = twr_sender_open(session, 0);
  ASSERT_NE(sender, nullptr);
  EXPECT_EQ(connection->nextText(), "startReportingSessionForID 77");
  std::thread realTime([&] {
    TestPayload payload;
    twr_put_int(payload.get(), "number", 5);
    twr_put_double(payload.get(), "twreporting_timestamp", 1.5);
    for (int at = 0; at < 3; ++at)
      EXPECT_EQ(twr_sender_send(sender, TWR_CATEGORY_VOLUME, TWR_TYPE_GENERIC, payload.get()), TWR_OK);
  });
  EXPECT_THAT(connection->nextTexts(3), ElementsAre(message(5), message(5), message(5)));
  realTime.join();
  twr_session_stop(session, nullptr, nullptr);
  EXPECT_EQ(connection->nextText(), "stopReportingSessionForID 77");
  EXPECT_EQ(twr_sender_dropped(sender), 0U);
  twr_sender_close(sender);
}

TEST_F(ClientEngineTest, ReportsMessagesThatARingDropped) {
  const auto connection = connectWithSession();
  twr_sender* sender = twr_sender_open(session, 128);
  TestPayload payload;
  twr_put_text(payload.get(), "text", std::string(500, 'x').c_str());
  EXPECT_EQ(twr_sender_send(sender, 1, 1, payload.get()), TWR_TOO_LARGE);
  EXPECT_EQ(twr_sender_dropped(sender), 1U);
  EXPECT_EQ(info().messages_dropped, 1U);
  twr_sender_close(sender);
  EXPECT_EQ(connection->nextMap().integer("twreporting_dropped"), 1);
  EXPECT_EQ(info().messages_dropped, 1U);
}

TEST_F(ClientEngineTest, TheMessageAfterAFullRingSaysHowManyItDropped) {
  daemon.reset();  // so that the ring is not emptied
  session = twr_session_create(client, 77);
  twr_sender* sender = twr_sender_open(session, 256);
  TestPayload payload;
  twr_put_int(payload.get(), "number", 5);
  twr_put_double(payload.get(), "twreporting_timestamp", 1.5);
  const auto push = [&] { return twr_sender_send(sender, TWR_CATEGORY_VOLUME, 0, payload.get()); };
  int taken = 0;
  while (push() == TWR_OK) ++taken;
  ASSERT_GT(taken, 0);
  EXPECT_EQ(push(), TWR_FULL);

  daemon = std::make_unique<ScriptedServer>(path);
  const auto connection = daemon->accept();
  EXPECT_EQ(connection->nextText(), "createReportingSession 77");
  for (int at = 0; at < taken; ++at) EXPECT_EQ(connection->nextText(), message(5));
  EXPECT_EQ(push(), TWR_OK);
  EXPECT_EQ(connection->nextText(), message(5, ",\"twreporting_dropped\":2"));
  EXPECT_EQ(push(), TWR_OK);
  EXPECT_EQ(connection->nextText(), message(5));
  twr_sender_close(sender);
}

TEST_F(ClientEngineTest, ASessionsEndReportsLossesThatNoMessageHasReported) {
  daemon.reset();
  ClientSettings chosen = settings(path);
  chosen.queueBytes = 2048;
  makeClientWith(chosen);
  const int taken = fillQueue();
  twr_session_destroy(session, nullptr, nullptr);

  daemon = std::make_unique<ScriptedServer>(path);
  const auto connection = daemon->accept();
  EXPECT_EQ(connection->nextText(), "createReportingSession 77");
  for (int at = 0; at < taken; ++at) EXPECT_EQ(connection->nextText(), message(at));
  const RpcFrame loss = connection->next();
  EXPECT_EQ(loss.arguments.at(0)->asMap()->integer("twreporting_dropped"), 2);
  EXPECT_EQ(loss.arguments.at(1)->integer(), TWR_CATEGORY_VOLUME);
  EXPECT_EQ(loss.arguments.at(2)->integer(), TWR_TYPE_UNKNOWN);
  EXPECT_EQ(connection->nextText(), "destroyReportingSession 77");
}

TEST_F(ClientEngineTest, ReportsTheErrorOfThePathWithASocket) {
  daemon.reset();  // its socket stays
  ClientSettings chosen = settings(path);
  chosen.socketPaths.push_back(path + "-nobody");
  makeClientWith(chosen);
  EXPECT_EQ(twr_client_connect(client, kScriptPatienceMs), TWR_NOT_CONNECTED);
  EXPECT_EQ(info().last_error, ECONNREFUSED);
}

TEST_F(ClientEngineTest, OpensNoRingOverItsBound) {
  session = twr_session_create(client, 77);
  EXPECT_EQ(twr_sender_open(session, TWR_MOST_RING_BYTES + 1), nullptr);
}

TEST_F(ClientEngineTest, FlushesRings) {
  const auto connection = connectWithSession();
  twr_sender* sender = twr_sender_open(session, 0);
  TestPayload payload;
  twr_put_int(payload.get(), "number", 1);
  twr_put_double(payload.get(), "twreporting_timestamp", 1.5);
  EXPECT_EQ(twr_sender_send(sender, TWR_CATEGORY_VOLUME, TWR_TYPE_GENERIC, payload.get()), TWR_OK);
  EXPECT_EQ(twr_client_flush(client, kScriptPatienceMs), TWR_OK);
  EXPECT_EQ(info().messages_sent, 1U);
  EXPECT_EQ(connection->nextText(), message(1));
}

// How often the client's thread has waited.
long waitsOfClientThread() {
  const std::string count = statusOfClientThread("voluntary_ctxt_switches:");
  return count.empty() ? -1 : std::stol(count);
}

TEST_F(ClientEngineTest, IsNotWokenByRequestsThatWaitForADaemon) {
  daemon.reset();
  ClientSettings chosen = settings(path);
  chosen.firstDelay = chosen.maxDelay = milliseconds(1'000'000);
  chosen.queueBytes = std::size_t{16} * 1024 * 1024;
  makeClientWith(chosen);
  session = twr_session_create(client, 77);
  EXPECT_EQ(twr_client_connect(client, kScriptPatienceMs), TWR_NOT_CONNECTED);
  while (waitsOfClientThread() < 1) std::this_thread::yield();
  long before = waitsOfClientThread();
  for (int at = 0; at < 10'000; ++at) send(at);
  EXPECT_LE(waitsOfClientThread() - before, 1);
}

TEST_F(ClientEngineTest, IsUsableFromManyThreads) {
  ClientSettings chosen = settings(path);
  chosen.queueBytes = std::size_t{16} * 1024 * 1024;
  makeClientWith(chosen);
  const auto connection = connectWithSession();
  constexpr int kThreads = 4;
  constexpr int kEach = 200;
  std::vector<std::thread> threads;
  for (int thread = 0; thread < kThreads; ++thread) {
    threads.emplace_back([&, thread] {
      twr_session* own = twr_session_create(client, 1000 + thread);
      twr_sender* sender = twr_sender_open(own, 1 << 20);
      TestPayload payload;
      for (int at = 0; at < kEach; ++at) {
        EXPECT_EQ(twr_session_send(session, 1, 1, payload.get(), nullptr, nullptr), TWR_OK);
        EXPECT_EQ(twr_sender_send(sender, 1, 1, payload.get()), TWR_OK);
        if (at % 50 == 0) {
          EXPECT_EQ(twr_session_start(own, AnswerLog::note, log.as("s")), TWR_OK);
        }
        info();
      }
      EXPECT_EQ(twr_session_destroy(own, nullptr, nullptr), TWR_OK);
    });
  }
  int messages = 0;
  int destroyed = 0;
  while (destroyed < kThreads) {
    const std::string method = connection->next().method;
    ASSERT_NE(method, "");
    messages += method == "sendMessage" ? 1 : 0;
    destroyed += method == "destroyReportingSession" ? 1 : 0;
  }
  for (std::thread& thread : threads) thread.join();
  EXPECT_EQ(messages, 2 * kThreads * kEach);
}

}  // namespace
}  // namespace tonewerk
