// SPDX-License-Identifier: Apache-2.0
#pragma once

#include <cstdint>
#include <optional>
#include <string>

#include "platform/linux/store/StoreReader.h"

namespace CLI {
class App;
}

namespace tonewerk {

struct Tool;

// The options by which commands choose among stored events: --name, --since, --until and --limit.
class EventFilterOptions {
 public:
  // Declares them for `command`, whose footer says how times are written. The object outlives it. What has no
  // name gets no --name.
  void addTo(CLI::App& command);
  void addWithoutNameTo(CLI::App& command);

  // What they say. None when one is wrong; `tool` has then said so.
  [[nodiscard]] std::optional<EventFilter> filter(Tool& tool) const;

 private:
  std::optional<std::string> name_;
  std::optional<std::string> since_;
  std::optional<std::string> until_;
  std::optional<std::int64_t> limit_;
};

}  // namespace tonewerk
