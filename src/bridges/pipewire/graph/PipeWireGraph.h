// SPDX-License-Identifier: Apache-2.0
#pragma once

#include <chrono>
#include <memory>

#include "bridges/pipewire/Console.h"
#include "bridges/pipewire/graph/GraphModel.h"
#include "bridges/pipewire/graph/PipeWireLoop.h"
#include "bridges/pipewire/graph/ProfileObserver.h"
#include "values/GrowingDelay.h"

struct pw_context;

namespace tonewerk {

// Passes the objects of the PipeWire daemon's graph to a GraphModel, and clears the model when that daemon
// goes away. Passes the profiler's data to a ProfileObserver while the graph has audio streams. Connects
// again until a daemon is there. It only reads: it adds nothing to the graph.
//
// Used on the loop's thread only.
class PipeWireGraph {
 public:
  // All arguments outlive this object.
  PipeWireGraph(PipeWireLoop& loop, GraphModel& model, ProfileObserver& profiles, const Console& console);
  PipeWireGraph(const PipeWireGraph&) = delete;
  PipeWireGraph& operator=(const PipeWireGraph&) = delete;
  ~PipeWireGraph();

  // False when the library cannot be used because its configuration is missing; trying again would not help.
  [[nodiscard]] bool open();

 private:
  class Connection;

  void connect();
  void established();
  void lost();
  void retryNow();

  GraphModel& model_;
  ProfileObserver& profiles_;
  const Console& console_;
  PipeWireLoop& loop_;
  pw_context* context_ = nullptr;
  std::unique_ptr<Connection> connection_;
  GrowingDelay retryDelay_{std::chrono::milliseconds(250), std::chrono::milliseconds(4000)};
  bool established_ = false;  // this connection's daemon has answered
  bool hasReportedAbsence_ = false;
  std::unique_ptr<EventLoop::Timer> retryTimer_;
};

}  // namespace tonewerk
