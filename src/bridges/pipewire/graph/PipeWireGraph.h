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

// Tells a GraphModel what is in the graph of the PipeWire daemon, and clears it when that daemon goes away;
// tells a ProfileObserver how its drivers do, as long as there are streams of sound. A daemon that is not
// there, or no longer, is tried again until it is. It only looks: it adds nothing to the graph.
//
// For the loop's thread.
class PipeWireGraph {
 public:
  // All outlive this.
  PipeWireGraph(PipeWireLoop& loop, GraphModel& model, ProfileObserver& profiles, const Console& console);
  PipeWireGraph(const PipeWireGraph&) = delete;
  PipeWireGraph& operator=(const PipeWireGraph&) = delete;
  ~PipeWireGraph();

  // False when the library itself cannot be used (its configuration is missing): trying again would not help.
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
  bool established_ = false;  // the daemon of this connection has spoken
  bool saidAbsent_ = false;
  std::unique_ptr<EventLoop::Timer> retryTimer_;
};

}  // namespace tonewerk
