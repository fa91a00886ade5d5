// SPDX-License-Identifier: Apache-2.0
#pragma once

#include <optional>
#include <string>

#include "platform/Chanmeter.h"

namespace tonewerk {

struct Tool;

// Chooses the channels to show by patterns for driver and group (*, ?, [...]). Without a pattern, all match.
struct ChannelFilter {
  std::optional<std::string> driver;
  std::optional<std::string> group;

  bool fits(const ChanmeterSample& sample) const;
};

// Prints all channels, or the changes since the last call. Each call also finds new channels.
class ChannelPrinter {
 public:
  // All arguments must outlive this object.
  ChannelPrinter(Tool& tool, Chanmeter& chanmeter, const ChannelFilter& filter)
      : tool_(tool), chanmeter_(chanmeter), filter_(filter) {}

  // False when a source could not be read; the others are printed.
  [[nodiscard]] bool printValues();

  // Prints a block with the time and the channels that have changed since the last call. The first call
  // prints nothing. `at` is in seconds since 1970.
  void printChanges(double at);

 private:
  // Null when no source could be read.
  [[nodiscard]] Chanmeter::Samples takeSamples(std::optional<ChanmeterError>& error);
  // Returns how many were printed.
  std::size_t print(const ChanmeterSamples& samples, std::optional<double> changedAt);

  Tool& tool_;
  Chanmeter& chanmeter_;
  const ChannelFilter& filter_;
  Chanmeter::Samples earlier_;
};

}  // namespace tonewerk
