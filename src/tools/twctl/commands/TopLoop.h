// SPDX-License-Identifier: Apache-2.0
#pragma once

#include <functional>
#include <optional>
#include <string>
#include <vector>

#include "tools/twctl/show/Terminal.h"
#include "values/Value.h"

namespace tonewerk {

// Shows pages that change until the user quits.
class LiveScreen {
 public:
  enum class Event { kTime, kResized, kQuit };

  virtual ~LiveScreen() = default;

  virtual TerminalSize size() const = 0;
  virtual void show(const std::vector<std::string>& lines) = 0;

  // In seconds of a monotonic clock.
  virtual double now() const = 0;
  // Waits until `time`, or until another event.
  [[nodiscard]] virtual Event waitUntil(double time) = 0;
};

// Lists the daemon's sessions. None on failure, or when the user quits meanwhile.
using SessionSource = std::function<std::optional<std::vector<ValueMap>>()>;

// Shows the sessions, and updates them every `interval` seconds, until the screen quits or the source returns
// none.
void runTop(const SessionSource& source, LiveScreen& screen, double interval);

}  // namespace tonewerk
