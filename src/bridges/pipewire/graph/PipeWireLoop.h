// SPDX-License-Identifier: Apache-2.0
#pragma once

#include <memory>

#include "bridges/pipewire/EventLoop.h"

struct pw_loop;
struct pw_main_loop;

namespace tonewerk {

// Runs the event loop on which PipeWire's events arrive. pw_init() must be called before it is made, and
// pw_deinit() after it is destroyed.
class PipeWireLoop final : public EventLoop {
 public:
  // Null when the system refuses.
  [[nodiscard]] static std::unique_ptr<PipeWireLoop> make();
  ~PipeWireLoop() override;
  PipeWireLoop(const PipeWireLoop&) = delete;
  PipeWireLoop& operator=(const PipeWireLoop&) = delete;

  [[nodiscard]] std::unique_ptr<Source> watch(int descriptor, std::function<void()> onReadable) override;
  [[nodiscard]] std::unique_ptr<Timer> makeTimer(std::function<void()> onExpired) override;
  // Replaces the signal's effect on the process: it now only runs `onSignal`. Null when the system refuses.
  [[nodiscard]] std::unique_ptr<Source> watchSignal(int signal, std::function<void()> onSignal);

  // Runs callbacks until one of them calls quit().
  void run();
  void quit();

  pw_loop* native() const;

 private:
  explicit PipeWireLoop(pw_main_loop* loop) : loop_(loop) {}

  pw_main_loop* loop_;
};

}  // namespace tonewerk
