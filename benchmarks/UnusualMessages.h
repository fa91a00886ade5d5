// SPDX-License-Identifier: Apache-2.0
#pragma once

#include <array>
#include <cstddef>
#include <cstdint>

#include "IngestMessages.h"

namespace tonewerk {

// Messages whose form no audio client chooses, but any client may.
enum class UnusualForm {
  kWide,       // 512 keys, always the same
  kNewKeys,    // 11 keys, all of them new in each message
  kNewOrders,  // 11 keys, always the same, in an order of its own in each message
  kNested,     // a map in a map, as deep as frames may be
  kLarge,      // 300 KiB, more than a read takes
};
inline constexpr std::array kHostileForms{UnusualForm::kNewKeys, UnusualForm::kNewOrders,
                                          UnusualForm::kNested, UnusualForm::kLarge};

// Makes `count` messages for one session. Each differs from the one before it.
IngestMessages unusualMessages(UnusualForm form, std::int64_t reporterID, std::size_t count);

}  // namespace tonewerk
