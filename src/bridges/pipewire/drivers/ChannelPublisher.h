// SPDX-License-Identifier: Apache-2.0
#pragma once

#include <chrono>
#include <functional>
#include <memory>
#include <optional>
#include <string>

#include "bridges/pipewire/Console.h"
#include "bridges/pipewire/EventLoop.h"
#include "platform/Clock.h"
#include "values/ValueMap.h"

namespace tonewerk {

// Keeps a file of driver channels in the reporting daemon's runtime directory.
//
// Readers see a whole file, the old or the new one. It is rewritten when its content has changed, at most
// once in kInterval, and whenever publish() asks for it. One that a dead process left behind is replaced by
// the first writing. A file that cannot be written is said once, and tried again with the next change.
//
// For the loop's thread.
class ChannelPublisher {
 public:
  static constexpr std::chrono::seconds kInterval{1};

  using Content = std::function<ValueMap()>;

  // `content` says what the file is to hold. The others outlive this.
  ChannelPublisher(EventLoop& loop, const Clock& clock, const Console& console, std::string fileName,
                   Content content);

  // The daemon is there, and keeps this runtime directory, which may have lost the file: publishes.
  void open(const std::string& runtimeDirectory);
  // The content may have changed. Nothing is written before open().
  void changed();
  void publish();
  // Removes the file, and writes no more.
  void withdraw();

 private:
  void write();

  const Clock& clock_;
  const Console& console_;
  const std::string fileName_;
  const Content content_;
  std::string directory_;  // empty when not open
  std::string written_;    // what the file holds; empty when that is not known
  std::optional<std::chrono::nanoseconds> writtenAt_;
  bool isDue_ = false;  // the timer runs
  bool saidFailure_ = false;
  std::unique_ptr<EventLoop::Timer> timer_;  // last: its callback uses the others
};

}  // namespace tonewerk
