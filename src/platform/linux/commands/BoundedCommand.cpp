// SPDX-License-Identifier: Apache-2.0
#include "platform/linux/commands/BoundedCommand.h"

#include <algorithm>
#include <array>
#include <cerrno>
#include <csignal>
#include <fcntl.h>
#include <optional>
#include <poll.h>
#include <spawn.h>
#include <sys/syscall.h>
#include <sys/wait.h>
#include <system_error>
#include <unistd.h>
#include <utility>

#include "platform/linux/descriptors/FileDescriptor.h"

namespace tonewerk {
namespace {

using End = BoundedCommand::End;
using Clock = std::chrono::steady_clock;

struct Pipe {
  FileDescriptor reading;
  FileDescriptor writing;
};

bool openPipe(Pipe& pipe) {
  std::array<int, 2> ends{};
  if (pipe2(ends.data(), O_CLOEXEC) != 0) return false;
  pipe.reading.reset(ends[0]);
  pipe.writing.reset(ends[1]);
  // Only this end: the program is to block when the pipe is full.
  return fcntl(pipe.reading.get(), F_SETFL, O_NONBLOCK) == 0;
}

// Starts the program in its own process group, with no descriptor of this process except its output.
class SpawnSettings {
 public:
  explicit SpawnSettings(int output) {
    posix_spawn_file_actions_init(&actions_);
    posix_spawn_file_actions_addopen(&actions_, STDIN_FILENO, "/dev/null", O_RDONLY, 0);
    posix_spawn_file_actions_adddup2(&actions_, output, STDOUT_FILENO);
    posix_spawn_file_actions_addopen(&actions_, STDERR_FILENO, "/dev/null", O_WRONLY, 0);
    posix_spawn_file_actions_addclosefrom_np(&actions_, STDERR_FILENO + 1);
    posix_spawnattr_init(&attributes_);
    posix_spawnattr_setflags(&attributes_,
                             POSIX_SPAWN_SETPGROUP | POSIX_SPAWN_SETSIGMASK | POSIX_SPAWN_SETSIGDEF);
    posix_spawnattr_setpgroup(&attributes_, 0);
    sigset_t signals;
    sigemptyset(&signals);
    posix_spawnattr_setsigmask(&attributes_, &signals);
    sigfillset(&signals);
    posix_spawnattr_setsigdefault(&attributes_, &signals);
  }
  SpawnSettings(const SpawnSettings&) = delete;
  SpawnSettings& operator=(const SpawnSettings&) = delete;
  ~SpawnSettings() {
    posix_spawn_file_actions_destroy(&actions_);
    posix_spawnattr_destroy(&attributes_);
  }

  int spawn(pid_t& process, const std::vector<std::string>& arguments) const {
    std::vector<char*> pointers;
    pointers.reserve(arguments.size() + 1);
    for (const std::string& argument : arguments) pointers.push_back(const_cast<char*>(argument.c_str()));
    pointers.push_back(nullptr);
    return posix_spawnp(&process, pointers.front(), &actions_, &attributes_, pointers.data(), environ);
  }

 private:
  posix_spawn_file_actions_t actions_;
  posix_spawnattr_t attributes_;
};

// The descriptor is readable when the process has ended. On Debian 12 the C library's header for it does not
// compile as C++.
int openProcess(pid_t process) { return static_cast<int>(syscall(SYS_pidfd_open, process, 0)); }

// Owns a program that was started. Ends it together with its process group and leaves no zombie.
class RunningProgram {
 public:
  RunningProgram(pid_t process, FileDescriptor output)
      : process_(process),
        watch_(openProcess(process)),
        watchError_(watch_ ? 0 : errno),
        output_(std::move(output)) {}
  RunningProgram(const RunningProgram&) = delete;
  RunningProgram& operator=(const RunningProgram&) = delete;
  ~RunningProgram() { static_cast<void>(end()); }

  // Appends its output to `output`. None when it has ended by itself.
  std::optional<End> takeOutput(std::string& output, std::size_t maxBytes, Clock::time_point deadline) {
    if (!watch_) {
      errno = watchError_;
      return End::kNotStarted;
    }
    for (;;) {
      std::array<pollfd, 2> waited{pollfd{watch_.get(), POLLIN, 0}, pollfd{output_.get(), POLLIN, 0}};
      if (!wait(waited, deadline)) return End::kTimedOut;
      // When the end is seen, all that it wrote before is in the pipe.
      const bool hasEnded = waited[0].revents != 0;
      if (!readAvailable(output, maxBytes, deadline)) return End::kTooMuchOutput;
      if (hasEnded) return std::nullopt;
    }
  }

  // Kills the process group and waits for the program. Its status, as waitpid() gives it.
  int end() {
    if (process_ < 0) return status_;
    // Before waitpid(): until then no other process or group can get its number.
    kill(-process_, SIGKILL);
    while (waitpid(process_, &status_, 0) < 0 && errno == EINTR) {
    }
    process_ = -1;
    return status_;
  }

 private:
  static bool wait(std::array<pollfd, 2>& waited, Clock::time_point deadline) {
    for (;;) {
      const auto left = std::chrono::ceil<std::chrono::milliseconds>(deadline - Clock::now());
      if (left.count() <= 0) return false;
      constexpr long kMaxPollMs = 60'000;
      const int count =
          poll(waited.data(), waited.size(), static_cast<int>(std::min(left.count(), kMaxPollMs)));
      if (count > 0) return true;
    }
  }

  // False when there are more than `maxBytes` bytes.
  bool readAvailable(std::string& output, std::size_t maxBytes, Clock::time_point deadline) {
    std::array<char, 16'384> buffer;
    // The time also ends a program that never stops writing.
    while (output_ && Clock::now() < deadline) {
      const ssize_t count = read(output_.get(), buffer.data(), buffer.size());
      if (count < 0 && errno == EINTR) continue;
      if (count < 0 && errno == EAGAIN) return true;
      if (count <= 0) {
        output_.reset();  // no process has it open any more
        return true;
      }
      const std::size_t taken = std::min(static_cast<std::size_t>(count), maxBytes - output.size());
      output.append(buffer.data(), taken);
      if (taken < static_cast<std::size_t>(count)) return false;
    }
    return true;
  }

  pid_t process_;
  int status_ = 0;
  FileDescriptor watch_;
  int watchError_;
  FileDescriptor output_;
};

std::string messageOf(int error) { return std::generic_category().message(error); }

BoundedCommand::Result notStarted(int error) { return {End::kNotStarted, 0, {}, messageOf(error)}; }

void readStatus(int status, BoundedCommand::Result& result) {
  if (WIFSIGNALED(status)) {
    result.end = End::kSignalled;
    result.status = WTERMSIG(status);
    result.problem = "ended by signal " + std::to_string(result.status);
    return;
  }
  result.end = End::kExited;
  result.status = WEXITSTATUS(status);
  if (result.status != 0) result.problem = "ended with status " + std::to_string(result.status);
}

}  // namespace

BoundedCommand::BoundedCommand(std::vector<std::string> arguments, const Limits& limits)
    : arguments_(std::move(arguments)), limits_(limits) {}

BoundedCommand BoundedCommand::shell(std::string commandLine, const Limits& limits) {
  return {{"/bin/sh", "-c", std::move(commandLine)}, limits};
}

BoundedCommand::Result BoundedCommand::run() const {
  const auto deadline = Clock::now() + limits_.time;
  if (arguments_.empty()) return notStarted(EINVAL);
  Pipe pipe;
  if (!openPipe(pipe)) return notStarted(errno);
  pid_t process = -1;
  const int error = SpawnSettings(pipe.writing.get()).spawn(process, arguments_);
  if (error != 0) return notStarted(error);
  pipe.writing.reset();
  RunningProgram program(process, std::move(pipe.reading));

  Result result;
  const std::optional<End> ended = program.takeOutput(result.output, limits_.bytes, deadline);
  if (!ended) {
    readStatus(program.end(), result);
    return result;
  }
  result.end = *ended;
  switch (*ended) {
    case End::kTimedOut:
      result.problem = "timed out after " + std::to_string(limits_.time.count()) + " ms";
      break;
    case End::kTooMuchOutput:
      result.problem = "wrote more than " + std::to_string(limits_.bytes) + " bytes";
      break;
    default:
      result.problem = "cannot be watched: " + messageOf(errno);
      break;
  }
  return result;
}

}  // namespace tonewerk
