// SPDX-License-Identifier: Apache-2.0
#pragma once

#include <optional>
#include <string>

#include "platform/Chanmeter.h"

namespace tonewerk {

struct Tool;

// Which channels to show: those whose driver and group fit these patterns (*, ?, [...]); none for all.
struct ChannelFilter {
  std::optional<std::string> driver;
  std::optional<std::string> group;

  bool fits(const ChanmeterSample& sample) const;
};

// Prints the channels there are, or what changed since it was asked last. Each time it looks for new ones.
class ChannelPrinter {
 public:
  // All are borrowed.
  ChannelPrinter(Tool& tool, Chanmeter& chanmeter, const ChannelFilter& filter)
      : tool_(tool), chanmeter_(chanmeter), filter_(filter) {}

  // False when some source could not be read; the others are printed.
  [[nodiscard]] bool printValues();

  // A block of its own: the time, and below it the channels in which something happened since the last call.
  // The first call prints nothing. `at`: seconds since 1970.
  void printChanges(double at);

 private:
  // Null when nothing could be read.
  [[nodiscard]] Chanmeter::Samples takeSamples(std::optional<ChanmeterError>& error);
  // Returns how many were printed.
  std::size_t print(const ChanmeterSamples& samples, std::optional<double> changedAt);

  Tool& tool_;
  Chanmeter& chanmeter_;
  const ChannelFilter& filter_;
  Chanmeter::Samples earlier_;
};

}  // namespace tonewerk
