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

// Captures diagnostics into the diagnostics store. Each capture is a folder of "captures", named after its
// session's identifier. docs/diagnostics.md describes the contents and the reasons for refusal.
//
// A reply is called on the caller's thread, before the call returns. It reports the decision; the capture
// need not be on the disk yet. From then on the caller can cancel the session. Refused requests get a reply
// with the reason.
//
// The number of captures accepted on the present day is kept in the preference "accepted" of
// "com.orvane.tonewerk.captures", so that it survives a restart.
class LinuxCapsa final : public Capsa {
 public:
  static constexpr std::string_view kPreferenceDomain = "com.orvane.tonewerk.captures";
  static constexpr std::string_view kAcceptedKey = "accepted";  // a table of "day" (a text) and "count"

  // All references must outlive this object. Call finish() here before finish() of the store.
  LinuxCapsa(DiagnosticsStore& store, PreferenceStore& preferences, SerialQueueFactory& queues,
             TimerService& timers, const Clock& clock, const LogCategory& log);
  LinuxCapsa(const LinuxCapsa&) = delete;
  LinuxCapsa& operator=(const LinuxCapsa&) = delete;
  // Calls finish().
  ~LinuxCapsa() override;

  std::unique_ptr<FaultsignReporter> makeReporter() override;

  // Drops and logs the pending captures, and refuses all later requests. When it has returned, the count is
  // on the disk, and no more captures are added to the store.
  void finish();

 private:
  class Reporter;
  struct Service;

  const std::shared_ptr<Service> service_;  // reporters keep weak pointers to it
};

}  // namespace tonewerk
