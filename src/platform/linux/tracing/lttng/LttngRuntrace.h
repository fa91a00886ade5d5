// SPDX-License-Identifier: Apache-2.0
#pragma once

#include <chrono>
#include <memory>

#include "platform/linux/tracing/Tracing.h"
#include "platform/linux/tracing/lttng/AbandonableThread.h"

namespace tonewerk {

// Traces signposts with LTTng. The session daemon is talked to on one thread, because the control library
// takes no two at once and has no time-outs.
//
// A start reads the probe list, makes sure that a session daemon runs and hears this process, and asks for
// the signposts that the list names. The finished trace lies in a directory of its own until its token goes.
// The daemon passes a signpost of its own at the beginning and the end.
class LttngRuntrace final : public Runtrace {
 public:
  // A control thread that is busy for longer than this is taken for one that hangs.
  static constexpr std::chrono::seconds kMaxBusy{20};

  explicit LttngRuntrace(const TracingParts& parts);
  LttngRuntrace(const LttngRuntrace&) = delete;
  LttngRuntrace& operator=(const LttngRuntrace&) = delete;
  // Gives up traces that are under way and ends the private session daemon.
  ~LttngRuntrace() override;

  [[nodiscard]] std::shared_ptr<RuntraceSession> makeSession(
      const RuntraceConfiguration& configuration) override;

 private:
  class Control;
  class Course;
  class Session;

  const std::shared_ptr<Control> control_;  // used on the thread, which may outlive this
  AbandonableThread thread_;                // last: it uses the control
};

}  // namespace tonewerk
