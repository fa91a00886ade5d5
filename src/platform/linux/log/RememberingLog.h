// SPDX-License-Identifier: Apache-2.0
#pragma once

#include <memory>

#include "platform/linux/log/LogLayer.h"

namespace tonewerk {

class Clock;
class RecentLines;

// Passes lines on to another log and keeps the last ones in `lines`, in the format of StreamLog. Turns each
// line into valid UTF-8 first, because the journal shows any other line as a blob.
class RememberingLog final : public LogLayer {
 public:
  // `clock` outlives the log.
  RememberingLog(std::unique_ptr<Log> log, std::shared_ptr<RecentLines> lines, const Clock& clock);
  ~RememberingLog() override;

  void write(std::string_view subsystem, std::string_view category, LogLevel level,
             std::string_view message) override;

 private:
  const std::shared_ptr<RecentLines> lines_;
  const Clock& clock_;
};

}  // namespace tonewerk
