// SPDX-License-Identifier: Apache-2.0
#include "UserScenes.h"

#include <cerrno>
#include <csignal>
#include <cstdint>
#include <cstdio>
#include <cstdlib>
#include <exception>
#include <fcntl.h>
#include <stdexcept>
#include <sys/prctl.h>
#include <sys/wait.h>
#include <unistd.h>

#include "ServerProcess.h"
#include "platform/linux/descriptors/FileDescriptor.h"
#include "support/users/RoundTripProbe.h"
#include "support/users/UserIdentity.h"

namespace tonewerk {
namespace {

constexpr std::int64_t kQuietReporterID = 77;

// Runs a function in a process of its own, as another user, and reads what that writes.
class UserProcess {
 public:
  // `work` gets a descriptor to write to. The process ends when it has returned.
  UserProcess(std::uint32_t user, const std::function<void(int output)>& work) {
    int ends[2];
    if (::pipe2(ends, O_CLOEXEC) != 0) throw std::runtime_error("pipe");
    input_.reset(ends[0]);
    const FileDescriptor output(ends[1]);
    process_ = ::fork();
    if (process_ == 0) become(user, work, output.get());
    if (process_ < 0) throw std::runtime_error("fork");
  }
  UserProcess(const UserProcess&) = delete;
  UserProcess& operator=(const UserProcess&) = delete;
  ~UserProcess() {
    if (process_ <= 0) return;
    ::kill(process_, SIGKILL);
    ::waitpid(process_, nullptr, 0);
  }

  // Reads so many bytes, or all up to the end. Returns how many.
  std::size_t read(void* bytes, std::size_t count) const {
    std::size_t at = 0;
    while (at < count) {
      const ssize_t more = ::read(input_.get(), static_cast<char*>(bytes) + at, count - at);
      if (more < 0 && errno == EINTR) continue;
      if (more <= 0) break;
      at += static_cast<std::size_t>(more);
    }
    return at;
  }

 private:
  [[noreturn]] static void become(std::uint32_t user, const std::function<void(int)>& work, int output) {
    try {
      if (const std::error_code error = becomeUser(user)) throw std::runtime_error(error.message());
      work(output);
    } catch (const std::exception& error) {
      std::fprintf(stderr, "user %u: %s\n", user, error.what());
      ::_exit(EXIT_FAILURE);
    }
    ::_exit(EXIT_SUCCESS);
  }

  pid_t process_ = -1;
  FileDescriptor input_;
};

void writeAll(int output, const void* bytes, std::size_t count) {
  for (std::size_t at = 0; at < count;) {
    const ssize_t more = ::write(output, static_cast<const char*>(bytes) + at, count - at);
    if (more < 0 && errno != EINTR) throw std::runtime_error("write");
    if (more > 0) at += static_cast<std::size_t>(more);
  }
}

void probe(const std::string& socketPath, std::chrono::milliseconds duration, int output) {
  ProbePlan plan;
  plan.duration = duration;
  const RoundTripTimes times = probeRoundTrips(socketPath, kQuietReporterID, plan);
  for (const std::chrono::nanoseconds time : times.sorted()) {
    const std::int64_t count = time.count();
    writeAll(output, &count, sizeof(count));
  }
}

UserScene flood(std::size_t connections, const std::string& what) {
  return {what, [connections](Attacker& attacker, const std::function<void()>& begun) {
            attacker.openFlood(connections);
            begun();
            attacker.flood();
          }};
}

}  // namespace

std::vector<UserScene> userScenes() {
  constexpr std::size_t kMegabyte = 1'000'000;
  constexpr std::size_t kMostNamed = 4'096;
  constexpr std::size_t kMostSessions = 4'090;
  constexpr std::size_t kBroadcastBytes = 3'500;
  const auto nothing = [](Attacker&, const std::function<void()>& begun) {
    begun();
    for (;;) ::pause();
  };
  const auto often = [](Attacker& attacker, const std::function<void()>& begun) {
    attacker.openSessions(1);
    for (;;) {
      attacker.sendToOneSessionOften(kMegabyte, kMostNamed);
      begun();
    }
  };
  const auto broadcast = [](Attacker& attacker, const std::function<void()>& begun) {
    attacker.openSessions(kMostSessions);
    for (;;) {
      attacker.broadcast(kBroadcastBytes);
      begun();
    }
  };
  return {{"nobody", nothing},
          flood(1, "1 flooding connection"),
          flood(100, "100 flooding connections"),
          {"1 MB, a session named 4,096 times", often},
          {"3.5 KB for 4,090 sessions", broadcast}};
}

std::vector<std::chrono::nanoseconds> measureBeside(const UserScene& scene, const std::string& program,
                                                    std::chrono::milliseconds duration) {
  ServerProcess server;
  server.start(program, {});
  openToAllUsers(server.socketPath());
  const UserProcess busy(kAlice, [&](int output) {
    Attacker attacker(server.socketPath());
    bool hasBegun = false;
    scene.attack(attacker, [&] {
      if (!hasBegun) writeAll(output, "", 1);
      hasBegun = true;
    });
  });
  char begun = 0;
  if (busy.read(&begun, 1) != 1) throw std::runtime_error("the busy client has ended");
  const UserProcess quiet(kBob, [&](int output) { probe(server.socketPath(), duration, output); });
  std::vector<std::chrono::nanoseconds> times;
  for (std::int64_t time = 0; quiet.read(&time, sizeof(time)) == sizeof(time);) times.emplace_back(time);
  if (times.empty()) throw std::runtime_error("the quiet client has ended");
  return times;
}

}  // namespace tonewerk
