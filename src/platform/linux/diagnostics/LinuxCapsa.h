// SPDX-License-Identifier: Apache-2.0
#pragma once

#include <memory>
#include <string_view>

#include "platform/FaultsignReporter.h"

namespace tonewerk {

class Clock;
class DiagnosticsStore;
class LogCategory;
class PreferenceStore;
class SerialQueueFactory;
class TimerService;

// Captures diagnostics into the diagnostics store, each as a folder of "captures" that is named by its
// session's identifier. docs/diagnostics.md says what is in it, and what is refused.
//
// A reply comes on the caller's thread, before the call that it answers returns: when a capture was decided
// on, not when it is on the disk. So whoever is told of a session can cancel it from then on. Parameters that
// are not accepted are answered too, with why.
//
// How many captures the day has seen outlives the process, as the preference "accepted" of
// "com.orvane.tonewerk.captures".
class LinuxCapsa final : public Capsa {
 public:
  static constexpr std::string_view kPreferenceDomain = "com.orvane.tonewerk.captures";
  static constexpr std::string_view kAcceptedKey = "accepted";  // a table of "day" (a text) and "count"

  // Everything referred to outlives it, and the store is not finished before this is.
  LinuxCapsa(DiagnosticsStore& store, PreferenceStore& preferences, SerialQueueFactory& queues,
             TimerService& timers, const Clock& clock, const LogCategory& log);
  LinuxCapsa(const LinuxCapsa&) = delete;
  LinuxCapsa& operator=(const LinuxCapsa&) = delete;
  // finish().
  ~LinuxCapsa() override;

  std::unique_ptr<FaultsignReporter> makeReporter() override;

  // Drops the captures that are pending, which is logged, and refuses all that come later. When it has
  // returned the count is on the disk and nothing more goes to the store.
  void finish();

 private:
  class Reporter;
  struct Service;

  const std::shared_ptr<Service> service_;  // reporters look for it
};

}  // namespace tonewerk
