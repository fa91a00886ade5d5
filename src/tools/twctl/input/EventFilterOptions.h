// SPDX-License-Identifier: Apache-2.0
#pragma once

#include <cstdint>
#include <initializer_list>
#include <optional>
#include <string>

#include "platform/linux/store/StoreReader.h"
#include "tools/twctl/input/TimeRangeOptions.h"

namespace CLI {
class App;
class Option;
}  // namespace CLI

namespace tonewerk {

struct Tool;

// Declares and reads the options by which every listing chooses what it shows: --since, --until, -n, and of
// --name, --app, --device, --service and --session those that make sense for what is listed.
class EventFilterOptions {
 public:
  enum class Choice { kName, kApplication, kDevice, kService, kSession };

  // Declares the options for `command`, and explains in its footer how times are written. `what`: what is
  // listed, in the plural. Of the choices that are not in `choices`, those about sessions are refused with
  // the reason. This object outlives `command`.
  void addTo(CLI::App& command, const std::string& what, std::initializer_list<Choice> choices);

  // The filter. None when an option is wrong; the problem is then printed.
  [[nodiscard]] std::optional<EventFilter> filter(Tool& tool) const;

  // Whether -n was given, also as "all"; whether a time was.
  bool hasLimit() const { return limit_.has_value(); }
  bool hasTime() const { return range_.isGiven(); }

  // Declares -n, which takes a number or "all", for commands that have a part of the options.
  static CLI::Option& addLimit(CLI::App& command, std::optional<std::string>& limit);
  // None for "all".
  static std::optional<std::int64_t> limitOf(const std::optional<std::string>& limit);
  // Declares options that other listings have, such as "-n,--limit", only to refuse them with the reason.
  static void refuse(CLI::App& command, std::initializer_list<const char*> options,
                     const std::string& problem);
  // Declares --service, which refuses names of services that there are not.
  static CLI::Option& addService(CLI::App& command, std::optional<std::string>& service,
                                 const std::string& what);

 private:
  std::optional<std::string> name_;
  TimeRangeOptions range_;
  std::optional<std::string> limit_;
  std::optional<std::string> application_;
  std::optional<std::string> device_;
  std::optional<std::string> service_;
  std::optional<std::int64_t> session_;
};

}  // namespace tonewerk
