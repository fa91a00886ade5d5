// SPDX-License-Identifier: Apache-2.0
#pragma once

#include <functional>
#include <optional>
#include <vector>

#include "tools/twctl/show/AudioHealth.h"
#include "tools/twctl/show/Terminal.h"
#include "tools/twctl/show/TopView.h"
#include "values/Value.h"

namespace tonewerk {

// Shows pages that change until the user quits.
class LiveScreen {
 public:
  enum class Event { kTime, kResized, kKey, kQuit };

  virtual ~LiveScreen() = default;

  virtual TerminalSize size() const = 0;
  virtual void show(const std::vector<TopLine>& lines) = 0;

  // In seconds of a monotonic clock.
  virtual double now() const = 0;
  // Waits until `time`, or until another event.
  [[nodiscard]] virtual Event waitUntil(double time) = 0;
  // The key for which waitUntil() has returned kKey.
  virtual char32_t key() const = 0;
};

// Lists the daemon's sessions. None on failure, or when the user quits meanwhile.
using SessionSource = std::function<std::optional<std::vector<ValueMap>>()>;
using HealthSource = std::function<AudioHealth()>;

// Shows the sessions and the health of the audio, and updates them every `interval` seconds, until the user
// quits or the source of sessions returns none.
void runTop(const SessionSource& sessions, const HealthSource& health, LiveScreen& screen, double interval);

}  // namespace tonewerk
