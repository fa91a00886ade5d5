// SPDX-License-Identifier: Apache-2.0
#pragma once

#include <array>
#include <cerrno>
#include <chrono>
#include <cstdint>
#include <optional>
#include <span>
#include <sys/epoll.h>
#include <system_error>

#include "platform/linux/descriptors/FileDescriptor.h"

namespace tonewerk {

// Waits for several descriptors at once (epoll). The caller chooses a number for each of them.
class Epoll {
 public:
  struct Event {
    std::uint64_t identifier;
    std::uint32_t events;  // EPOLLIN and so on
  };

  Epoll() : descriptor_(::epoll_create1(EPOLL_CLOEXEC)), error_(descriptor_ ? 0 : errno) {}

  // Why the system has given none. Then add() and change() fail, and wait() does not wait.
  std::error_code problem() const { return {error_, std::generic_category()}; }

  [[nodiscard]] bool add(int descriptor, std::uint64_t identifier, std::uint32_t events) {
    return control(EPOLL_CTL_ADD, descriptor, identifier, events);
  }
  [[nodiscard]] bool change(int descriptor, std::uint64_t identifier, std::uint32_t events) {
    return control(EPOLL_CTL_MOD, descriptor, identifier, events);
  }
  // Does nothing for a descriptor that was not added.
  void remove(int descriptor) { static_cast<void>(control(EPOLL_CTL_DEL, descriptor, 0, 0)); }

  // Waits until a descriptor is ready or the time is up; without a time-out there is no limit. The events are
  // valid until the next call. There are none when the time is up or a signal interrupted the wait.
  std::span<const Event> wait(std::optional<std::chrono::milliseconds> timeout) {
    std::array<epoll_event, kMaxAtOnce> ready;
    const int count = ::epoll_wait(descriptor_.get(), ready.data(), kMaxAtOnce,
                                   timeout ? static_cast<int>(timeout->count()) : -1);
    std::size_t kept = 0;
    for (; count > 0 && kept < static_cast<std::size_t>(count); ++kept) {
      events_[kept] = {ready[kept].data.u64, ready[kept].events};
    }
    return {events_.data(), kept};
  }

 private:
  static constexpr int kMaxAtOnce = 64;

  [[nodiscard]] bool control(int operation, int descriptor, std::uint64_t identifier, std::uint32_t events) {
    epoll_event event{};
    event.events = events;
    event.data.u64 = identifier;
    return ::epoll_ctl(descriptor_.get(), operation, descriptor, &event) == 0;
  }

  FileDescriptor descriptor_;
  int error_;
  std::array<Event, kMaxAtOnce> events_{};
};

}  // namespace tonewerk
