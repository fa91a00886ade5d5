// SPDX-License-Identifier: Apache-2.0
#pragma once

#include <cstdint>
#include <map>
#include <memory>

#include "bridges/pipewire/EventLoop.h"
#include "bridges/pipewire/graph/GraphModel.h"
#include "bridges/pipewire/sessions/Overload.h"
#include "bridges/pipewire/sessions/StreamReporter.h"

namespace tonewerk {

// One StreamReporter for each stream of the graph, and the one timer they share. For the loop's thread.
class StreamReports final : public StreamObserver {
 public:
  // All outlive this.
  StreamReports(SessionSink& sink, const Clock& clock, ReporterIdentifiers& identifiers, EventLoop& loop);

  void streamChanged(std::uint32_t stream, const StreamState& state) override;
  void streamGone(std::uint32_t stream) override;

  // Ignored when there is no such stream.
  void streamOverloaded(std::uint32_t stream, const Overload& overload);

  // Nothing said so far has reached a daemon: every stream's session begins anew.
  void restartAll();
  // The sessions are there, but what they were told is lost: every stream tells how it plays.
  void retellAll();

 private:
  void deadlinesReached();
  void rearm();

  SessionSink& sink_;
  const Clock& clock_;
  ReporterIdentifiers& identifiers_;
  std::map<std::uint32_t, StreamReporter> reporters_;
  std::unique_ptr<EventLoop::Timer> timer_;  // last: its callback uses the others
};

}  // namespace tonewerk
