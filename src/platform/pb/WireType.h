// SPDX-License-Identifier: Apache-2.0
#pragma once

namespace tonewerk::PB {

// How a field's value is encoded after its key.
enum class WireType {
  kVarint = 0,
  kFixed64 = 1,
  kLengthDelimited = 2,
  kStartGroup = 3,
  kEndGroup = 4,
  kFixed32 = 5
};

}  // namespace tonewerk::PB
