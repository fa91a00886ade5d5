// SPDX-License-Identifier: Apache-2.0
#pragma once

#include <chrono>
#include <memory>

#include "platform/linux/tracing/Tracing.h"
#include "platform/linux/tracing/lttng/AbandonableThread.h"

namespace tonewerk {

// Traces signposts with LTTng. All calls to the session daemon are made on one control thread, because the
// control library is not thread-safe and has no timeouts.
//
// A start reads the probe list, makes sure that a session daemon is running and has registered this process,
// and enables the signposts of the list. The finished trace is in a directory of its own until its token is
// destroyed. The daemon passes its own signpost at the beginning and the end of a trace.
class LttngRuntrace final : public Runtrace {
 public:
  // If one task keeps the control thread busy for longer than this, the thread is assumed to hang.
  static constexpr std::chrono::seconds kMaxBusy{20};

  explicit LttngRuntrace(const TracingParts& parts);
  LttngRuntrace(const LttngRuntrace&) = delete;
  LttngRuntrace& operator=(const LttngRuntrace&) = delete;
  // Ends the private session daemon. Traces that are still running are not completed.
  ~LttngRuntrace() override;

  [[nodiscard]] std::shared_ptr<RuntraceSession> makeSession(
      const RuntraceConfiguration& configuration) override;

 private:
  class Control;
  class TraceRun;
  class Session;

  const std::shared_ptr<Control> control_;  // used by the thread, which may outlive this object
  AbandonableThread thread_;                // last: it uses control_
};

}  // namespace tonewerk
