// SPDX-License-Identifier: Apache-2.0
#pragma once

#include <functional>
#include <optional>
#include <string>
#include <vector>

#include "tools/twctl/show/Terminal.h"
#include "values/Value.h"

namespace tonewerk {

// Where pages are shown that change until somebody has seen enough.
class LiveScreen {
 public:
  enum class Event { kTime, kResized, kQuit };

  virtual ~LiveScreen() = default;

  virtual TerminalSize size() const = 0;
  virtual void show(const std::vector<std::string>& lines) = 0;

  // Seconds of a time that never goes back.
  virtual double now() const = 0;
  // Waits until then, or until something happens before.
  [[nodiscard]] virtual Event waitUntil(double time) = 0;
};

// Lists the sessions there are; none when that failed, or somebody has seen enough meanwhile.
using SessionSource = std::function<std::optional<std::vector<ValueMap>>()>;

// Shows what sessions do, anew every `interval` seconds, until the screen or the source says to stop.
void runTop(const SessionSource& source, LiveScreen& screen, double interval);

}  // namespace tonewerk
