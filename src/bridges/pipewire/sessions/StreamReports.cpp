// SPDX-License-Identifier: Apache-2.0
#include "bridges/pipewire/sessions/StreamReports.h"

#include <algorithm>
#include <optional>

namespace tonewerk {

StreamReports::StreamReports(SessionSink& sink, const Clock& clock, ReporterIdentifiers& identifiers,
                             EventLoop& loop)
    : sink_(sink),
      clock_(clock),
      identifiers_(identifiers),
      timer_(loop.makeTimer([this] { deadlinesReached(); })) {}

void StreamReports::streamChanged(std::uint32_t stream, const StreamState& state) {
  reporters_.try_emplace(stream, sink_, clock_, identifiers_).first->second.update(state);
  rearm();
}

void StreamReports::streamGone(std::uint32_t stream) {
  const auto found = reporters_.find(stream);
  if (found == reporters_.end()) return;
  found->second.end();
  reporters_.erase(found);
  rearm();
}

void StreamReports::streamOverloaded(std::uint32_t stream, const Overload& overload) {
  const auto found = reporters_.find(stream);
  if (found == reporters_.end()) return;
  found->second.overloaded(overload);
  rearm();
}

void StreamReports::restartAll() {
  for (auto& [stream, reporter] : reporters_) reporter.restart();
  rearm();
}

void StreamReports::resendAll() {
  for (auto& [stream, reporter] : reporters_) reporter.resend();
  rearm();
}

void StreamReports::deadlinesReached() {
  for (auto& [stream, reporter] : reporters_) reporter.deadlineReached();
  rearm();
}

void StreamReports::rearm() {
  std::optional<std::chrono::nanoseconds> earliest;
  for (const auto& [stream, reporter] : reporters_) {
    const std::optional<std::chrono::nanoseconds> deadline = reporter.deadline();
    if (deadline) earliest = std::min(*deadline, earliest.value_or(*deadline));
  }
  if (earliest) {
    timer_->arm(*earliest - clock_.monotonic());
  } else {
    timer_->disarm();
  }
}

}  // namespace tonewerk
