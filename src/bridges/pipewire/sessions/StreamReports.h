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

// Keeps one StreamReporter for each stream of the graph, and one timer for all of them. Used on the loop's
// thread only.
class StreamReports final : public StreamObserver {
 public:
  // All arguments outlive this object.
  StreamReports(SessionSink& sink, const Clock& clock, ReporterIdentifiers& identifiers, EventLoop& loop);

  void streamChanged(std::uint32_t stream, const StreamState& state) override;
  void streamGone(std::uint32_t stream) override;

  // Ignored when there is no such stream.
  void streamOverloaded(std::uint32_t stream, const Overload& overload);

  // No message has reached a daemon yet: begins a new session for every stream.
  void restartAll();
  // The sessions exist, but the messages sent to them are lost: sends the present state of every stream.
  void resendAll();

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
