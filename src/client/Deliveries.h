// SPDX-License-Identifier: Apache-2.0
#pragma once

#include <memory>
#include <optional>
#include <utility>
#include <vector>

#include "client/DecodedAnswer.h"
#include "client/PendingReply.h"
#include "tonewerk/reporting.h"

namespace tonewerk {

// One call of a caller's function that is to be made once no lock is held.
struct Delivery {
  PendingReply reply;
  std::shared_ptr<DecodedAnswer> answer;
  std::optional<twr_state> state;  // instead of an answer: the client's new state
};

using Deliveries = std::vector<Delivery>;

}  // namespace tonewerk
