// SPDX-License-Identifier: Apache-2.0
#include "client/ClientRegistry.h"

#include <atomic>
#include <chrono>
#include <dlfcn.h>
#include <filesystem>
#include <fstream>
#include <functional>
#include <gmock/gmock.h>
#include <sys/wait.h>
#include <thread>
#include <unistd.h>

#include "client/ClientTest.h"

namespace tonewerk {
namespace {

using testing::ElementsAre;

#if defined(__SANITIZE_THREAD__)
constexpr bool kChildMayHaveThreads = false;
#elif defined(__has_feature)
#if __has_feature(thread_sanitizer)
constexpr bool kChildMayHaveThreads = false;
#else
constexpr bool kChildMayHaveThreads = true;
#endif
#else
constexpr bool kChildMayHaveThreads = true;
#endif

std::size_t entriesOf(const char* directory) {
  const std::filesystem::directory_iterator all(directory);
  return static_cast<std::size_t>(std::distance(begin(all), end(all)));
}

bool isMapped(const std::string& library) {
  std::ifstream maps("/proc/self/maps");
  for (std::string line; std::getline(maps, line);)
    if (line.find(library) != std::string::npos) return true;
  return false;
}

bool endedWell(pid_t child) {
  int status = 0;
  return ::waitpid(child, &status, 0) == child && WIFEXITED(status) && WEXITSTATUS(status) == 0;
}

// Runs `check` in a forked child. True when `check` was, and the child exited normally.
bool isTrueInChild(const std::function<bool()>& check) {
  const pid_t child = ::fork();
  if (child == 0) ::_exit(check() ? 0 : 1);
  return endedWell(child);
}

// Ends a child process when its thread has returned. A sanitizer would then look for leaks, and would not
// know the memory of the threads that only the parent has.
struct ChildThreadEnd {
  bool isChild = false;
  ~ChildThreadEnd() {
    if (isChild) ::_exit(0);
  }
};
thread_local ChildThreadEnd childThreadEnd;

class ForkedClientTest : public ClientTest {};

TEST_F(ForkedClientTest, IsDeadInTheChildAndUndisturbedInTheParent) {
  const auto connection = connectWithSession();
  twr_sender* sender = twr_sender_open(session, 0);
  EXPECT_TRUE(isTrueInChild([&] {
    TestPayload payload;
    twr_client_info known{};
    known.size = sizeof(known);
    return twr_session_start(session, nullptr, nullptr) == TWR_FORKED && send(1) == TWR_FORKED &&
           twr_session_set_service_type(session, 1, nullptr, nullptr) == TWR_FORKED &&
           twr_session_set_configuration(session, payload.get(), nullptr, nullptr) == TWR_FORKED &&
           twr_session_stop(session, nullptr, nullptr) == TWR_FORKED &&
           twr_client_send(client, 1, 1, payload.get(), nullptr, 0, nullptr, nullptr) == TWR_FORKED &&
           twr_client_get_all_reporters(client, nullptr, nullptr) == TWR_FORKED &&
           twr_client_connect(client, 1000) == TWR_FORKED && twr_client_flush(client, 1000) == TWR_FORKED &&
           twr_client_get_info(client, &known) == TWR_FORKED && known.state == TWR_STATE_ENDED &&
           twr_session_create(client, 5) == nullptr && twr_sender_open(session, 0) == nullptr &&
           twr_sender_send(sender, 1, 1, payload.get()) == TWR_FORKED && twr_session_id(session) == 77;
  }));
  EXPECT_EQ(send(2), TWR_OK);
  EXPECT_EQ(connection->nextText(), message(2));
}

TEST_F(ForkedClientTest, FreesItsObjectsInTheChild) {
  const auto connection = connectWithSession();
  twr_sender* sender = twr_sender_open(session, 0);
  ASSERT_EQ(twr_session_start(session, AnswerLog::note, log.as("stopped")), TWR_OK);
  EXPECT_EQ(connection->next().method, "startReportingSessionForID");
  EXPECT_TRUE(isTrueInChild([&] {
    twr_sender_close(sender);
    const bool isForked = twr_session_destroy(session, AnswerLog::note, log.as("never")) == TWR_FORKED;
    twr_client_destroy(client, 1'000'000);
    return isForked && log.rest().empty();
  }));
  EXPECT_EQ(twr_session_stop(session, nullptr, nullptr), TWR_OK);
  EXPECT_EQ(connection->next().method, "stopReportingSessionForID");
}

TEST_F(ForkedClientTest, LeavesNoDescriptorInTheChild) {
  auto connection = connectWithSession();
  int pipes[2];
  ASSERT_EQ(::pipe(pipes), 0);
  const pid_t child = ::fork();
  if (child == 0) {
    // Keeps the child until the parent has finished its checks.
    char byte = 0;
    ::close(pipes[1]);
    ::_exit(::read(pipes[0], &byte, 1) == 0 ? 0 : 1);
  }
  destroyClient(0);
  // If the socket were open in the child, too, the connection would not end here.
  EXPECT_TRUE(connection->waitForEnd());
  ::close(pipes[0]);
  ::close(pipes[1]);
  ::waitpid(child, nullptr, 0);
}

TEST_F(ForkedClientTest, MakesAClientOfItsOwnInTheChild) {
  if (!kChildMayHaveThreads) GTEST_SKIP() << "the sanitizer allows a forked child no threads";
  const auto connection = connectWithSession();
  EXPECT_TRUE(isTrueInChild([&] {
    twr_client* own = makeClient(settings(path));
    twr_session* mine = twr_session_create(own, 5);
    const bool isSent = mine != nullptr && twr_client_flush(own, kScriptPatienceMs) == TWR_OK;
    twr_client_destroy(own, 0);
    twr_client_destroy(client, 0);
    return isSent;
  }));
  EXPECT_EQ(daemon->accept()->nextText(), "createReportingSession 5");
}

TEST_F(ForkedClientTest, ForksWhileTheClientIsBusy) {
  ClientSettings chosen = settings(path);
  chosen.queueBytes = std::size_t{1} << 20U;
  makeClientWith(chosen);
  const auto connection = connectWithSession();
  std::atomic<bool> isOver{false};
  std::thread reader([&] {
    while (!isOver) {
      const RpcFrame frame = connection->next();
      if (frame.method.empty() || frame.method == "last") return;
      if (frame.kind == RpcFrame::Kind::kRequest) connection->answer(frame.identifier, std::nullopt);
    }
  });
  std::vector<std::thread> callers;
  for (int at = 0; at < 2; ++at) {
    callers.emplace_back([&] {
      while (!isOver) {
        send(
            1, [](void*, const twr_answer*) {}, nullptr);
        twr_client_flush(client, 10);
      }
    });
  }
  for (int at = 0; at < 20; ++at) {
    EXPECT_TRUE(isTrueInChild([&] {
      const bool isDead = send(1) == TWR_FORKED;
      twr_client_destroy(client, 0);
      return isDead;
    }));
  }
  isOver = true;
  for (std::thread& caller : callers) caller.join();
  EXPECT_EQ(twr_client_request(client, "last", nullptr, nullptr, nullptr), TWR_OK);
  reader.join();
  EXPECT_EQ(info().connections, 1U);
}

TEST_F(ForkedClientTest, MayForkInsideACallback) {
  const auto connection = connectWithSession();
  void* context = log.as("send", [&](const twr_answer&) {
    EXPECT_TRUE(isTrueInChild([&] {
      const bool isDead = send(1) == TWR_FORKED;
      twr_client_destroy(client, 0);
      return isDead;
    }));
  });
  ASSERT_EQ(send(1, AnswerLog::note, context), TWR_OK);
  connection->answer(connection->next().identifier, std::nullopt);
  EXPECT_EQ(log.next(), "send: done");
  EXPECT_EQ(send(2), TWR_OK);
  EXPECT_EQ(connection->nextText(), message(2));
}

TEST_F(ForkedClientTest, MayBeDestroyedInAChildThatReturnsFromTheCallback) {
  const auto connection = connectWithSession();
  pid_t child = -1;
  void* context = log.as("send", [&](const twr_answer&) {
    child = ::fork();
    if (child != 0) return;
    childThreadEnd.isChild = true;
    twr_client_destroy(client, 0);
  });
  ASSERT_EQ(send(1, AnswerLog::note, context), TWR_OK);
  connection->answer(connection->next().identifier, std::nullopt);
  EXPECT_EQ(log.next(), "send: done");
  EXPECT_TRUE(endedWell(child));
}

// Loads libtwreporting as programs do.
class LoadedLibrary {
 public:
  LoadedLibrary() : handle_(::dlopen(TONEWERK_REPORTING_LIBRARY, RTLD_NOW | RTLD_LOCAL)) {
    EXPECT_NE(handle_, nullptr) << ::dlerror();
  }
  LoadedLibrary(const LoadedLibrary&) = delete;
  LoadedLibrary& operator=(const LoadedLibrary&) = delete;
  ~LoadedLibrary() {
    if (handle_ != nullptr) ::dlclose(handle_);
  }

  template <class Function>
  Function* function(const char* name) const {
    return reinterpret_cast<Function*>(::dlsym(handle_, name));
  }

 private:
  void* handle_;
};

// Its clients are never destroyed. This keeps the sanitizer from reporting their memory as leaked.
std::vector<void*>& abandoned() {
  static auto* all = new std::vector<void*>;
  return *all;
}

// This process's threads, with those of a sanitizer, which start with the program's first thread.
std::size_t threadsBefore() {
  pid_t first = 0;
  std::thread([&] { first = ::gettid(); }).join();
  // A joined thread may still be listed for a moment.
  while (std::filesystem::exists("/proc/self/task/" + std::to_string(first))) std::this_thread::yield();
  return entriesOf("/proc/self/task");
}

bool threadsBecome(std::size_t count) {
  const auto until = std::chrono::steady_clock::now() + std::chrono::milliseconds(kScriptPatienceMs);
  while (entriesOf("/proc/self/task") != count) {
    if (std::chrono::steady_clock::now() >= until) return false;
    std::this_thread::yield();
  }
  return true;
}

TEST(UnloadedLibraryTest, LeavesNoThreadNoDescriptorAndNoHandler) {
  TemporaryDirectory directory;
  ScriptedServer daemon(directory.path("reporting.sock"));
  const std::string path = directory.path("reporting.sock");
  { const LoadedLibrary once; }  // the loader keeps some memory after the first time
  const std::size_t threads = threadsBefore();
  const std::size_t descriptors = entriesOf("/proc/self/fd");
  for (int at = 0; at < 100; ++at) {
    {
      const LoadedLibrary library;
      twr_client_options options{};
      options.size = sizeof(options);
      options.socket_path = path.c_str();
      twr_client* client = library.function<decltype(twr_client_create)>("twr_client_create")(&options);
      ASSERT_NE(client, nullptr);
      abandoned().push_back(client);
      twr_session* session =
          library.function<decltype(twr_session_create)>("twr_session_create")(client, TWR_NEW_ID);
      ASSERT_NE(session, nullptr);
      ASSERT_NE(library.function<decltype(twr_sender_open)>("twr_sender_open")(session, 64), nullptr);
      ASSERT_EQ(library.function<decltype(twr_client_flush)>("twr_client_flush")(client, kScriptPatienceMs),
                TWR_OK);
      EXPECT_EQ(daemon.accept()->next().method, "createReportingSession");
      EXPECT_GT(entriesOf("/proc/self/task"), threads);
    }
    ASSERT_TRUE(threadsBecome(threads));
    ASSERT_EQ(entriesOf("/proc/self/fd"), descriptors);
    ASSERT_FALSE(isMapped("libtwreporting"));
  }
  // If its handlers were still registered, the fork would call unmapped memory.
  EXPECT_TRUE(isTrueInChild([] { return true; }));
}

TEST(UnloadedLibraryTest, EndsAClientThatWaitsForADaemon) {
  const std::size_t threads = threadsBefore();
  {
    const LoadedLibrary library;
    twr_client_options options{};
    options.size = sizeof(options);
    options.socket_path = "/nowhere/reporting.sock";
    twr_client* client = library.function<decltype(twr_client_create)>("twr_client_create")(&options);
    abandoned().push_back(client);
    EXPECT_EQ(library.function<decltype(twr_client_connect)>("twr_client_connect")(client, kScriptPatienceMs),
              TWR_NOT_CONNECTED);
  }
  EXPECT_TRUE(threadsBecome(threads));
  EXPECT_FALSE(isMapped("libtwreporting"));
}

}  // namespace
}  // namespace tonewerk
