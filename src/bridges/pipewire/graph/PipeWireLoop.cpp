// SPDX-License-Identifier: Apache-2.0
#include "bridges/pipewire/graph/PipeWireLoop.h"

#include <pipewire/pipewire.h>
#include <utility>

namespace tonewerk {

namespace {

using Callback = std::function<void()>;

// Owns a source of the native loop and the callback that it runs.
class NativeSource {
 public:
  NativeSource(pw_loop* loop, Callback callback)
      : loop_(loop), callback_(std::make_shared<const Callback>(std::move(callback))) {}
  NativeSource(const NativeSource&) = delete;
  NativeSource& operator=(const NativeSource&) = delete;
  ~NativeSource() {
    if (source_ != nullptr) pw_loop_destroy_source(loop_, source_);
  }

  void adopt(spa_source* source) { source_ = source; }
  spa_source* source() const { return source_; }
  pw_loop* loop() const { return loop_; }

  static void run(void* self) {
    // A copy, because the callback may destroy the source that holds it.
    const std::shared_ptr<const Callback> callback = static_cast<NativeSource*>(self)->callback_;
    (*callback)();
  }

 private:
  pw_loop* loop_;
  std::shared_ptr<const Callback> callback_;
  spa_source* source_ = nullptr;
};

class LoopSource final : public EventLoop::Source {
 public:
  LoopSource(pw_loop* loop, Callback callback) : native(loop, std::move(callback)) {}
  NativeSource native;
};

class LoopTimer final : public EventLoop::Timer {
 public:
  LoopTimer(pw_loop* loop, Callback callback) : native_(loop, std::move(callback)) {
    native_.adopt(pw_loop_add_timer(
        loop, [](void* self, std::uint64_t) { NativeSource::run(self); }, &native_));
  }

  void arm(std::chrono::nanoseconds delay) override {
    // A delay of zero would disarm the timer.
    const std::chrono::nanoseconds wait = std::max(delay, std::chrono::nanoseconds(1));
    const auto seconds = std::chrono::duration_cast<std::chrono::seconds>(wait);
    set({seconds.count(), (wait - seconds).count()});
  }
  void disarm() override { set({0, 0}); }

 private:
  void set(timespec value) {
    timespec once{0, 0};
    if (native_.source() != nullptr)
      pw_loop_update_timer(native_.loop(), native_.source(), &value, &once, false);
  }

  NativeSource native_;
};

std::unique_ptr<EventLoop::Source> orNull(std::unique_ptr<LoopSource> source) {
  if (source->native.source() == nullptr) return nullptr;
  return source;
}

}  // namespace

std::unique_ptr<PipeWireLoop> PipeWireLoop::make() {
  pw_main_loop* loop = pw_main_loop_new(nullptr);
  if (loop == nullptr) return nullptr;
  return std::unique_ptr<PipeWireLoop>(new PipeWireLoop(loop));
}

PipeWireLoop::~PipeWireLoop() { pw_main_loop_destroy(loop_); }

std::unique_ptr<EventLoop::Source> PipeWireLoop::watch(int descriptor, Callback onReadable) {
  auto source = std::make_unique<LoopSource>(native(), std::move(onReadable));
  source->native.adopt(pw_loop_add_io(
      native(), descriptor, SPA_IO_IN | SPA_IO_HUP | SPA_IO_ERR, false,
      [](void* self, int, std::uint32_t) { NativeSource::run(self); }, &source->native));
  return orNull(std::move(source));
}

std::unique_ptr<EventLoop::Timer> PipeWireLoop::makeTimer(Callback onExpired) {
  return std::make_unique<LoopTimer>(native(), std::move(onExpired));
}

std::unique_ptr<EventLoop::Source> PipeWireLoop::watchSignal(int signal, Callback onSignal) {
  auto source = std::make_unique<LoopSource>(native(), std::move(onSignal));
  source->native.adopt(pw_loop_add_signal(
      native(), signal, [](void* self, int) { NativeSource::run(self); }, &source->native));
  return orNull(std::move(source));
}

void PipeWireLoop::run() { pw_main_loop_run(loop_); }

void PipeWireLoop::quit() { pw_main_loop_quit(loop_); }

pw_loop* PipeWireLoop::native() const { return pw_main_loop_get_loop(loop_); }

}  // namespace tonewerk
