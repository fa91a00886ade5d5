// SPDX-License-Identifier: Apache-2.0
#pragma once

#include "bridges/pipewire/drivers/GlitchReports.h"
#include "bridges/pipewire/sessions/StreamReports.h"

namespace tonewerk {

// Passes the changes of streams on, and has glitches that are not judged yet reported before a stream's
// session ends.
class LeavingStreams final : public StreamObserver {
 public:
  // `reports` outlives this object.
  explicit LeavingStreams(StreamReports& reports) : reports_(reports) {}

  // Null for nobody.
  void tell(GlitchReports* glitches) { glitches_ = glitches; }

  void streamChanged(std::uint32_t stream, const StreamState& state) override {
    reports_.streamChanged(stream, state);
  }
  void streamGone(std::uint32_t stream) override {
    if (glitches_ != nullptr) glitches_->streamLeaves(stream);
    reports_.streamGone(stream);
  }

 private:
  StreamReports& reports_;
  GlitchReports* glitches_ = nullptr;
};

}  // namespace tonewerk
