// SPDX-License-Identifier: Apache-2.0
#pragma once

#include <cstdint>

#include "values/Value.h"

namespace tonewerk {

struct Tool;

// Prints watched messages, one a line: for people, or for programs as one JSON object.
class MessagePrinter {
 public:
  // `tool` outlives it.
  explicit MessagePrinter(const Tool& tool) : tool_(tool) {}

  // As the daemon has described it.
  void print(const ValueMap& message) const;
  void printMissed(std::uint64_t count) const;

 private:
  const Tool& tool_;
};

}  // namespace tonewerk
