// SPDX-License-Identifier: Apache-2.0
#pragma once

#include <cstddef>
#include <cstdint>
#include <functional>

#include "IngestMessages.h"
#include "values/ValueMap.h"

namespace tonewerk {

// Says which messages to make. Their number is `sessions` times `rounds`.
struct ClientMessagePlan {
  std::int64_t firstReporterID;
  std::size_t sessions;
  std::size_t rounds;
  bool allChange = false;  // none is redundant
};

// After any multiple of so many rounds, the messages can be sent again, as new ones.
inline constexpr std::size_t kClientMessageRounds = 10;

// Makes messages like those of audio clients: 8 to 15 entries, about 225 bytes as a request. Each session has
// one message a round, alternately of two kinds. In each round the sessions are in another order. Three of
// five messages of a kind change one or two entries, the others are redundant.
void eachClientMessage(const ClientMessagePlan& plan,
                       const std::function<void(const IngestMessages::Address& address,
                                                const ValueMap& payload, bool isStored)>& take);
IngestMessages clientMessages(const ClientMessagePlan& plan);

}  // namespace tonewerk
