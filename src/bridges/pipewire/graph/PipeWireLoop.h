// SPDX-License-Identifier: Apache-2.0
#pragma once

#include <memory>

#include "bridges/pipewire/EventLoop.h"

struct pw_loop;
struct pw_main_loop;

namespace tonewerk {

// The event loop on which PipeWire's own events arrive. pw_init() comes before it, pw_deinit() after.
class PipeWireLoop final : public EventLoop {
 public:
  // Null when the system refuses.
  [[nodiscard]] static std::unique_ptr<PipeWireLoop> make();
  ~PipeWireLoop() override;
  PipeWireLoop(const PipeWireLoop&) = delete;
  PipeWireLoop& operator=(const PipeWireLoop&) = delete;

  [[nodiscard]] std::unique_ptr<Source> watch(int descriptor, std::function<void()> onReadable) override;
  [[nodiscard]] std::unique_ptr<Timer> makeTimer(std::function<void()> onExpired) override;
  // Takes the signal from the process: from now on it only runs `onSignal`. Null when the system refuses.
  [[nodiscard]] std::unique_ptr<Source> watchSignal(int signal, std::function<void()> onSignal);

  // Returns after quit(), which is called from a callback.
  void run();
  void quit();

  pw_loop* native() const;

 private:
  explicit PipeWireLoop(pw_main_loop* loop) : loop_(loop) {}

  pw_main_loop* loop_;
};

}  // namespace tonewerk
