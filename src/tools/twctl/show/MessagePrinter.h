// SPDX-License-Identifier: Apache-2.0
#pragma once

#include <cstdint>

#include "values/Value.h"

namespace tonewerk {

struct Tool;

// Prints watched messages, one per line: as text for people, or as a JSON object for programs.
class MessagePrinter {
 public:
  // `tool` outlives it.
  explicit MessagePrinter(const Tool& tool) : tool_(tool) {}

  // `message` is a description that the daemon has sent.
  void print(const ValueMap& message) const;
  void printMissed(std::uint64_t count) const;

 private:
  const Tool& tool_;
};

}  // namespace tonewerk
