// SPDX-License-Identifier: Apache-2.0
#pragma once

#include <cstddef>
#include <vector>

#include "tonewerk/reporting.h"

namespace tonewerk {

// Holds a payload and its memory.
class TestPayload {
 public:
  explicit TestPayload(std::size_t bytes = 4096) : memory_(bytes) {
    twr_payload_init(&payload_, memory_.data(), memory_.size());
  }
  TestPayload(const TestPayload&) = delete;
  TestPayload& operator=(const TestPayload&) = delete;

  twr_payload* get() { return &payload_; }
  operator const twr_payload&() const { return payload_; }
  twr_payload* operator->() { return &payload_; }

 private:
  std::vector<unsigned char> memory_;
  twr_payload payload_;
};

}  // namespace tonewerk
