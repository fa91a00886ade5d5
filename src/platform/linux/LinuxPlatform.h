// SPDX-License-Identifier: Apache-2.0
#pragma once

#include <memory>

#include "platform/Platform.h"

namespace tonewerk {

class AllocatorReclaimer;
class DiagnosticsStore;
class LinuxCapsa;
struct Directories;
struct Tracing;

// One of each adapter, and the Platform made of them. Whoever makes it lets it outlive what uses the
// Platform.
//
// The sinks are the caller's: their adapters need the clock, the log and the preferences from here.
class LinuxPlatform {
 public:
  explicit LinuxPlatform(const Directories& directories);
  LinuxPlatform(const LinuxPlatform&) = delete;
  LinuxPlatform& operator=(const LinuxPlatform&) = delete;
  ~LinuxPlatform();

  Log& log();
  Clock& clock();
  SerialQueueFactory& queues();
  TimerService& timers();
  PreferenceStore& preferences();
  JsonService& json();
  FileSystem& files();
  AllocatorReclaimer& memory();
  // Whoever ends the daemon finishes these, in this order, before what uses the Platform is gone.
  LinuxCapsa& capsa();
  DiagnosticsStore& diagnostics();

  // Preferences and device facts are looked at again now: who reads them next finds them as they are.
  void readConfigurationAgain();
  // The runtime directory was made anew: what the adapters had in it is there again.
  void restoreRuntimeDirectory();

  // The services handed in outlive what uses the result.
  Platform platform(Metricon& metricon, Energybook& energybook, Diagwire& diagwire, LinkReport& linkReport,
                    const Tracing& tracing);

 private:
  struct Adapters;
  std::unique_ptr<Adapters> adapters_;
};

}  // namespace tonewerk
