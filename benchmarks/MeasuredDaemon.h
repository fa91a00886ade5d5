// SPDX-License-Identifier: Apache-2.0
#pragma once

#include <cstddef>
#include <string>

#include "ServerProcess.h"

namespace tonewerk {

// Says what the daemon does with messages besides keeping them until their session stops.
struct DaemonSettings {
  // Analytics events and real-time-communication messages go into the store, as without any preferences.
  // Otherwise there are no consumers and no backends, so that nothing is stored.
  bool records = true;
  // As on internal builds, each session gets a summary file at its stop.
  bool writesFiles = false;
  // The most that requests take which are kept, so that sessions outlive a crash. 0: none is kept.
  std::size_t journalMegabytes = 64;
};

// Runs a daemon in a directory of its own. Failures throw std::runtime_error.
class MeasuredDaemon {
 public:
  // An analytics event has so many names, and the store's view a row for each.
  static constexpr std::size_t kRowsAnEvent = 2;

  MeasuredDaemon(const std::string& program, const DaemonSettings& settings);

  ServerProcess& server() { return server_; }
  const ServerProcess& server() const { return server_; }
  std::string storePath() const { return server_.stateDirectory() + "/reports.db"; }

  // Checks that the store has exactly the events of `messages` messages, and nothing without recording.
  void checkStore(std::size_t messages) const;
  // The number of summary files.
  std::size_t files() const;

 private:
  DaemonSettings settings_;
  ServerProcess server_;
};

}  // namespace tonewerk
