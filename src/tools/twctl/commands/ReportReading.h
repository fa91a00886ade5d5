// SPDX-License-Identifier: Apache-2.0
#pragma once

#include <cstdint>
#include <optional>
#include <string>

#include "tools/twctl/input/TimeRangeOptions.h"
#include "tools/twctl/report/ReportData.h"
#include "tools/twctl/report/ReportScope.h"

namespace CLI {
class App;
}

namespace tonewerk {

struct Tool;

// Declares and reads the options that say what a report is about.
class ReportScopeOptions {
 public:
  // Declares the options for `command`. This object outlives `command`.
  void addTo(CLI::App& command);
  // The same without the end of the time, which a report of what happens now has not.
  void addOpenEndTo(CLI::App& command);

  // None when an option is wrong; the problem is then printed. A time that is given as a span ends now.
  [[nodiscard]] std::optional<ReportScope> scope(Tool& tool) const;

 private:
  void addChoice(CLI::App& command);

  std::optional<std::int64_t> session_;
  std::optional<std::string> application_;
  TimeRangeOptions range_;
};

// What a report says of the device that it is about. Prints a warning for a file that cannot be read.
[[nodiscard]] ValueMap reportedDevice(const Tool& tool);

// Reads the store, asks the daemon how it does, and says when and by which version. Prints nothing.
[[nodiscard]] ReportData readReport(const Tool& tool, const ReportScope& scope, const ValueMap& device);

}  // namespace tonewerk
