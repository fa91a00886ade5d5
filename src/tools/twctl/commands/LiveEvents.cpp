// SPDX-License-Identifier: Apache-2.0
#include "tools/twctl/commands/LiveEvents.h"

#include <algorithm>
#include <array>
#include <cassert>
#include <cerrno>
#include <climits>
#include <csignal>
#include <fcntl.h>
#include <poll.h>
#include <sys/ioctl.h>
#include <unistd.h>

namespace tonewerk {
namespace {

constexpr std::array kSignals{SIGINT, SIGTERM, SIGHUP, SIGQUIT, SIGWINCH};
constexpr char kStop = 's';
constexpr char kResize = 'r';

// The pipe that the signal handler writes to; -1 without a LiveEvents.
volatile std::sig_atomic_t handlersPipe = -1;
std::array<struct sigaction, kSignals.size()> before;

extern "C" void noteSignal(int number) {
  const int savedError = errno;
  const char byte = number == SIGWINCH ? kResize : kStop;
  // A full pipe already has signals to read.
  static_cast<void>(!::write(handlersPipe, &byte, 1));
  errno = savedError;
}

int millisecondsUntil(const std::optional<LiveEvents::Time>& until) {
  if (!until) return -1;
  const auto left =
      std::chrono::ceil<std::chrono::milliseconds>(*until - std::chrono::steady_clock::now()).count();
  return static_cast<int>(std::clamp<decltype(left)>(left, 0, INT_MAX));
}

}  // namespace

LiveEvents::LiveEvents(int in, int out, Keys keys) : in_(in), out_(out), keys_(keys) {
  assert(handlersPipe == -1);
  std::array<int, 2> ends{-1, -1};
  if (::pipe2(ends.data(), O_CLOEXEC | O_NONBLOCK) != 0)
    return;  // without a pipe, signals end the process as usual
  signals_ = FileDescriptor(ends[0]);
  handlersPipe = ends[1];
  for (std::size_t at = 0; at < kSignals.size(); ++at) {
    struct sigaction action {};
    action.sa_handler = noteSignal;
    if (kSignals[at] != SIGWINCH) action.sa_flags = static_cast<int>(SA_RESETHAND);
    ::sigaction(kSignals[at], &action, &before[at]);
  }
}

LiveEvents::~LiveEvents() {
  if (!signals_) return;
  for (std::size_t at = 0; at < kSignals.size(); ++at) ::sigaction(kSignals[at], &before[at], nullptr);
  ::close(handlersPipe);
  handlersPipe = -1;
}

LiveEvents::Event LiveEvents::wait(int readable, std::optional<Time> until) {
  while (!isStopped_) {
    // poll() ignores negative descriptors.
    std::array<pollfd, 4> polled{
        {{signals_.get(), POLLIN, 0}, {out_, 0, 0}, {in_, POLLIN, 0}, {readable, POLLIN, 0}}};
    const int count = ::poll(polled.data(), polled.size(), millisecondsUntil(until));
    if (count < 0 && errno != EINTR) break;
    if (count < 0) continue;
    if (polled[0].revents != 0) {
      if (const auto event = takeSignal()) return *event;
    }
    if (polled[1].revents != 0) break;
    if (polled[2].revents != 0 && takeKey()) return Event::kKey;
    if (polled[3].revents != 0) return Event::kReadable;
    if (until && std::chrono::steady_clock::now() >= *until) return Event::kTime;
  }
  isStopped_ = true;
  return Event::kStopped;
}

std::optional<LiveEvents::Event> LiveEvents::takeSignal() {
  char byte = 0;
  if (::read(signals_.get(), &byte, 1) != 1) return std::nullopt;
  if (byte == kResize) return Event::kResized;
  isStopped_ = true;
  return Event::kStopped;
}

bool LiveEvents::takeKey() {
  if (keys_ == Keys::kLeft) {
    int bytes = 0;
    if (::ioctl(in_, FIONREAD, &bytes) == 0 && bytes > 0) return true;
    in_ = -1;  // the end of the input
    return false;
  }
  const ssize_t count = ::read(in_, &key_, 1);
  if (count == 0) in_ = -1;  // the end of the input, which would always be readable
  if (count < 0 && errno != EINTR && errno != EAGAIN) in_ = -1;
  return count == 1;
}

}  // namespace tonewerk
