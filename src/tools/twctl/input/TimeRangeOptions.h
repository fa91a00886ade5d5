// SPDX-License-Identifier: Apache-2.0
#pragma once

#include <optional>
#include <string>

namespace CLI {
class App;
}

namespace tonewerk {

struct Tool;

// Declares and reads --since and --until.
class TimeRangeOptions {
 public:
  // Times in seconds since 1970; none for no limit.
  struct Range {
    std::optional<double> since;
    std::optional<double> until;
  };

  // Declares the options for `command`. `what`: whose times they limit, in the plural. This object outlives
  // `command`.
  void addTo(CLI::App& command, const std::string& what);
  // The same without --until.
  void addSinceTo(CLI::App& command, const std::string& what);

  // None when an option is wrong, or the range ends before it begins; the problem is then printed.
  [[nodiscard]] std::optional<Range> range(Tool& tool) const;

  // Whether there is one of the options.
  bool isGiven() const { return since_ || until_; }

  // How people write a time, for a footer.
  static constexpr const char* kForms =
      "A time is as 2026-11-20, \"2026-11-20 10:18\", 2026-11-20T10:18:00Z, today or yesterday,\n"
      "or how long ago: 90s, 10m, \"1 hour ago\".";

 private:
  std::optional<std::string> since_;
  std::optional<std::string> until_;
};

}  // namespace tonewerk
