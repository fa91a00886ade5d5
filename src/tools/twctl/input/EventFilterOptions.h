// SPDX-License-Identifier: Apache-2.0
#pragma once

#include <cstdint>
#include <optional>
#include <string>

#include "platform/linux/store/StoreReader.h"
#include "tools/twctl/input/TimeRangeOptions.h"

namespace CLI {
class App;
}

namespace tonewerk {

struct Tool;

// Declares and reads the options that choose among stored events: --name, --since, --until and --limit.
class EventFilterOptions {
 public:
  // Declare the options for `command`, and explain in its footer how times are written. This object outlives
  // `command`. Entries that have no name get no --name.
  void addTo(CLI::App& command);
  void addWithoutNameTo(CLI::App& command);

  // The filter. None when an option is wrong; the problem is then printed.
  [[nodiscard]] std::optional<EventFilter> filter(Tool& tool) const;

 private:
  std::optional<std::string> name_;
  TimeRangeOptions range_;
  std::optional<std::int64_t> limit_;
};

}  // namespace tonewerk
