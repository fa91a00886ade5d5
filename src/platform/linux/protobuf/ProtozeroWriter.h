// SPDX-License-Identifier: Apache-2.0
#pragma once

#include <string>

#include "platform/pb/Writer.h"

namespace tonewerk {

// Writes protocol-buffer bytes into a string.
class ProtozeroWriter final : public PB::Writer {
 public:
  void writeVarint(std::uint32_t tag, std::uint64_t value) override;
  void writeBytes(std::uint32_t tag, std::string_view value) override;

  const std::string& bytes() const { return bytes_; }

 private:
  std::string bytes_;
};

}  // namespace tonewerk
