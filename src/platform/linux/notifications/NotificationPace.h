// SPDX-License-Identifier: Apache-2.0
#pragma once

#include <chrono>
#include <functional>
#include <memory>
#include <string_view>

namespace tonewerk {

class TimerService;

// Slows down names that are posted all the time: a name that was quiet is told at once, afterwards at most
// once in kInterval. Whatever is posted meanwhile is told together, at the end of the interval, so the last
// post is always told:
//
//   posted    |   |||          |                  |
//   told      |        |       .    |       .     |
//             0       100 ms      200 ms
//
// Only names that were added are told, so files of other names cost nothing. Any thread.
class NotificationPace {
 public:
  static constexpr std::chrono::milliseconds kInterval{100};

  using Tell = std::function<void(std::string_view name)>;

  // `tell` runs on the thread that posts, or on that of the timers; it must not use this object. `timers`
  // outlives the object.
  NotificationPace(TimerService& timers, Tell tell);
  NotificationPace(const NotificationPace&) = delete;
  NotificationPace& operator=(const NotificationPace&) = delete;
  // When it returns, `tell` is not running and is not called again.
  ~NotificationPace();

  // A name that is added several times must be removed as often.
  void add(std::string_view name);
  void remove(std::string_view name);

  void post(std::string_view name);
  // Posts every name that was added.
  void postAll();

 private:
  struct State;
  const std::shared_ptr<State> state_;  // shared with ticks, which may end later than the object
};

}  // namespace tonewerk
