// SPDX-License-Identifier: Apache-2.0
#include "platform/linux/socket/ServerSocket.h"

#include <cstdlib>
#include <fcntl.h>
#include <filesystem>
#include <fstream>
#include <gmock/gmock.h>
#include <string>
#include <sys/file.h>
#include <sys/socket.h>
#include <sys/stat.h>
#include <sys/syscall.h>
#include <sys/wait.h>
#include <unistd.h>

#include "platform/linux/descriptors/UnixAddress.h"
#include "platform/linux/socket/RawClient.h"
#include "support/InterceptedCalls.h"
#include "support/TemporaryDirectory.h"

namespace tonewerk {
namespace {

using testing::HasSubstr;

class ServerSocketTest : public testing::Test {
 protected:
  std::unique_ptr<ServerSocket> open() { return ServerSocket::open(path, problem); }

  // Leaves what a killed daemon leaves: a socket's file on which no process listens.
  void leaveStaleSocket() const {
    const FileDescriptor dead(::socket(AF_UNIX, SOCK_STREAM, 0));
    const auto address = unixAddressOf(path);
    ASSERT_EQ(::bind(dead.get(), generic(*address), sizeof(*address)), 0);
    ASSERT_EQ(::listen(dead.get(), 1), 0);
  }

  // Locks the socket's directory as another process would: the lock belongs to a different open file.
  FileDescriptor lockOfAnother() const {
    FileDescriptor lock(::open(directory.path().c_str(), O_RDONLY | O_DIRECTORY | O_CLOEXEC));
    EXPECT_EQ(::flock(lock.get(), LOCK_EX | LOCK_NB), 0);
    return lock;
  }

  TemporaryDirectory directory;
  const std::string path = directory.path("reporting.sock");
  std::string problem;
};

TEST_F(ServerSocketTest, IsAccessibleToItsUserAndGroupOnly) {
  const auto socket = open();
  ASSERT_NE(socket, nullptr) << problem;
  EXPECT_EQ(socket->name(), path);
  struct stat made {};
  ASSERT_EQ(::stat(path.c_str(), &made), 0);
  EXPECT_EQ(made.st_mode & 0777U, 0660U);
  EXPECT_TRUE(RawClient(path).isConnected());
}

TEST_F(ServerSocketTest, HasItsModeWithAnyUmask) {
  const mode_t before = ::umask(0777);
  const auto socket = open();
  ::umask(before);
  ASSERT_NE(socket, nullptr) << problem;
  struct stat made {};
  ASSERT_EQ(::stat(path.c_str(), &made), 0);
  EXPECT_EQ(made.st_mode & 0777U, 0660U);
}

TEST_F(ServerSocketTest, MakesMissingDirectories) {
  const std::string deep = directory.path("run/tonewerk/reporting.sock");
  const auto socket = ServerSocket::open(deep, problem);
  ASSERT_NE(socket, nullptr) << problem;
  EXPECT_TRUE(RawClient(deep).isConnected());
}

TEST_F(ServerSocketTest, RemovesItsFileAtTheEnd) {
  ASSERT_NE(open(), nullptr);
  EXPECT_FALSE(std::filesystem::exists(path));
}

TEST_F(ServerSocketTest, KeepsAFileThatIsNotItsOwn) {
  auto socket = open();
  ASSERT_NE(socket, nullptr);
  std::filesystem::rename(path, directory.path("moved"));
  leaveStaleSocket();
  socket = nullptr;
  EXPECT_TRUE(std::filesystem::exists(path));
}

TEST_F(ServerSocketTest, ReplacesTheSocketOfADeadDaemon) {
  leaveStaleSocket();
  ASSERT_TRUE(std::filesystem::exists(path));
  const auto socket = open();
  ASSERT_NE(socket, nullptr) << problem;
  EXPECT_TRUE(RawClient(path).isConnected());
}

TEST_F(ServerSocketTest, RefusesASocketInUseAndNamesItsProcess) {
  const auto first = open();
  ASSERT_NE(first, nullptr);
  EXPECT_EQ(open(), nullptr);
  std::ifstream comm("/proc/self/comm");
  std::string name;
  std::getline(comm, name);
  EXPECT_EQ(problem, path + " is in use by " + name + " (" + std::to_string(::getpid()) + ")");
  EXPECT_TRUE(RawClient(path).isConnected());
}

TEST_F(ServerSocketTest, DoesNotReplaceAFileThatIsNotASocket) {
  std::ofstream(path) << "precious";
  EXPECT_EQ(open(), nullptr);
  EXPECT_EQ(problem, path + " is there and no socket");
  EXPECT_TRUE(std::filesystem::exists(path));
}

TEST_F(ServerSocketTest, SaysWhyItCannotListen) {
  EXPECT_EQ(ServerSocket::open(directory.path(std::string(200, 'x')), problem), nullptr);
  EXPECT_THAT(problem, HasSubstr("a socket's path cannot be"));
  std::ofstream(directory.path("file")) << "no directory";
  EXPECT_EQ(ServerSocket::open(directory.path("file/reporting.sock"), problem), nullptr);
  EXPECT_THAT(problem, HasSubstr("cannot make"));
}

TEST_F(ServerSocketTest, IsRecreatedInARecreatedDirectory) {
  const std::string run = directory.path("run");
  const std::string inRun = run + "/reporting.sock";
  const auto socket = ServerSocket::open(inRun, problem);
  ASSERT_NE(socket, nullptr) << problem;
  EXPECT_TRUE(socket->isInPlace());

  std::filesystem::remove_all(run);
  EXPECT_FALSE(socket->isInPlace());
  EXPECT_EQ(socket->recreate(problem), nullptr);
  EXPECT_EQ(problem, inRun + " went with its directory, and comes back with it");
  EXPECT_FALSE(std::filesystem::exists(run));

  std::filesystem::create_directory(run);
  const auto again = socket->recreate(problem);
  ASSERT_NE(again, nullptr) << problem;
  EXPECT_TRUE(again->isInPlace());
  EXPECT_FALSE(socket->isInPlace());
  EXPECT_TRUE(RawClient(inRun).isConnected());
}

TEST_F(ServerSocketTest, IsNotRecreatedWhereAnotherProcessListens) {
  const auto socket = open();
  ASSERT_NE(socket, nullptr);
  std::filesystem::remove(path);
  const auto others = open();
  ASSERT_NE(others, nullptr);
  EXPECT_FALSE(socket->isInPlace());
  EXPECT_EQ(socket->recreate(problem), nullptr);
  EXPECT_THAT(problem, HasSubstr("is in use by"));
  EXPECT_TRUE(others->isInPlace());
}

// The messaging thread once waited for this lock, so that another process could block it.
TEST_F(ServerSocketTest, IsNotRecreatedWhileAnotherProcessLocksTheDirectory) {
  const auto socket = open();
  ASSERT_NE(socket, nullptr);
  std::filesystem::remove(path);
  FileDescriptor others = lockOfAnother();
  EXPECT_EQ(socket->recreate(problem), nullptr);
  EXPECT_EQ(problem, directory.path() + " is locked by another process");
  EXPECT_FALSE(std::filesystem::exists(path));

  others.reset();
  EXPECT_NE(socket->recreate(problem), nullptr);
}

TEST_F(ServerSocketTest, KeepsItsFileWhileAnotherProcessLocksTheDirectory) {
  auto socket = open();
  ASSERT_NE(socket, nullptr);
  FileDescriptor others = lockOfAnother();
  socket = nullptr;
  EXPECT_TRUE(std::filesystem::exists(path));

  others.reset();
  EXPECT_NE(open(), nullptr) << problem;
}

TEST_F(ServerSocketTest, DoesNotLockToKeepAFileThatIsNotItsOwn) {
  auto socket = open();
  ASSERT_NE(socket, nullptr);
  std::filesystem::remove(path);
  int locks = 0;
  const auto count = [&locks](const seccomp_data&) {
    ++locks;
    return 0;
  };
  if (!runIntercepted(SYS_flock, count, [&] { socket = nullptr; })) {
    GTEST_SKIP() << "system calls cannot be intercepted here";
  }
  EXPECT_EQ(locks, 0);
}

// Arranges descriptors as systemd does. Runs in a child process.
bool passAsSystemdDoes(int listening) {
  return ::dup2(listening, 3) == 3 && ::setenv("LISTEN_PID", std::to_string(::getpid()).c_str(), 1) == 0 &&
         ::setenv("LISTEN_FDS", "1", 1) == 0;
}

// Returns 0 when everything is as expected.
int takesThePassedSocket(int listening, const std::string& path, const std::string& ownPath) {
  if (!passAsSystemdDoes(listening)) return 10;
  std::string problem;
  auto socket = ServerSocket::open(ownPath, problem);
  if (socket == nullptr || socket->fileDescriptor() != 3) return 11;
  if (std::filesystem::exists(ownPath)) return 12;
  if ((::fcntl(3, F_GETFL) & O_NONBLOCK) == 0 || (::fcntl(3, F_GETFD) & FD_CLOEXEC) == 0) return 13;
  if (!RawClient(path).isConnected()) return 14;
  if (std::getenv("LISTEN_FDS") != nullptr) return 15;
  if (!socket->isInPlace()) return 17;
  std::filesystem::rename(path, path + ".away");
  const bool isNotRecreated = !socket->isInPlace() && socket->recreate(problem) == nullptr &&
                              problem.find("restart twreportingd.socket") != std::string::npos;
  if (!isNotRecreated || std::filesystem::exists(path)) return 18;
  std::filesystem::rename(path + ".away", path);
  socket = nullptr;
  return std::filesystem::exists(path) ? 0 : 16;
}

// Returns 0 when a passed socket whose file was removed before is not in place.
int isNotInPlaceWithoutItsFile(int listening, const std::string& path, const std::string& ownPath) {
  std::filesystem::remove(path);
  if (!passAsSystemdDoes(listening)) return 10;
  std::string problem;
  const auto socket = ServerSocket::open(ownPath, problem);
  if (socket == nullptr) return 11;
  return socket->isInPlace() ? 12 : 0;
}

class PassedSocketTest : public ServerSocketTest {
 protected:
  PassedSocketTest() {
    const auto address = unixAddressOf(path);
    EXPECT_EQ(::bind(listening.get(), generic(*address), sizeof(*address)), 0);
    EXPECT_EQ(::listen(listening.get(), 5), 0);
  }
  int statusOfChild(int (*run)(int, const std::string&, const std::string&)) const {
    const pid_t child = ::fork();
    if (child == 0) ::_exit(run(listening.get(), path, directory.path("own.sock")));
    int status = 0;
    EXPECT_EQ(::waitpid(child, &status, 0), child);
    EXPECT_TRUE(WIFEXITED(status));
    return WEXITSTATUS(status);
  }

  const FileDescriptor listening{::socket(AF_UNIX, SOCK_STREAM, 0)};
};

TEST_F(PassedSocketTest, IsTakenAndKeepsItsFile) { EXPECT_EQ(statusOfChild(takesThePassedSocket), 0); }

TEST_F(PassedSocketTest, IsNotInPlaceWhenItsFileWasRemovedBefore) {
  EXPECT_EQ(statusOfChild(isNotInPlaceWithoutItsFile), 0);
}

}  // namespace
}  // namespace tonewerk
