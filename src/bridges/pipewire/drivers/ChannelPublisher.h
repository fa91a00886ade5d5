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

// Writes a file of driver channels into the reporting daemon's runtime directory and keeps it up to date.
//
// Readers always see a complete file, the old or the new one. The file is written again when its content has
// changed: after changed() at most once in kInterval, after publish() at once. The first write replaces a
// file that a dead process left behind. A failed write is reported once on the console and tried again with
// the next change.
//
// Used on the loop's thread only.
class ChannelPublisher {
 public:
  static constexpr std::chrono::seconds kInterval{1};

  using Content = std::function<ValueMap()>;

  // `content` returns the file's content. The references outlive this object.
  ChannelPublisher(EventLoop& loop, const Clock& clock, const Console& console, std::string fileName,
                   Content content);

  // Publishes in this runtime directory of a daemon that has just been connected; it may have lost the file.
  void open(const std::string& runtimeDirectory);
  // Says that the content may have changed. Nothing is written before open().
  void changed();
  // Writes the file now if its content has changed.
  void publish();
  // Removes the file; nothing is written until the next open().
  void withdraw();

 private:
  void write();

  const Clock& clock_;
  const Console& console_;
  const std::string fileName_;
  const Content content_;
  std::string directory_;  // empty when not open
  std::string written_;    // the file's content; empty when it is not known
  std::optional<std::chrono::nanoseconds> writtenAt_;
  bool isDue_ = false;  // the timer is armed
  bool hasReportedFailure_ = false;
  std::unique_ptr<EventLoop::Timer> timer_;  // last, because its callback uses the others
};

}  // namespace tonewerk
