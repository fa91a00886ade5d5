// SPDX-License-Identifier: Apache-2.0
#pragma once

#include <cstdint>
#include <memory>
#include <optional>
#include <string>
#include <vector>

#include "client/ReplyTable.h"
#include "platform/linux/messagepack/RpcFrame.h"
#include "tonewerk/reporting.h"

namespace tonewerk {

// An answer as callers of the C interface see it, with the memory that it points into.
class DecodedAnswer {
 public:
  explicit DecodedAnswer(twr_status status);
  // Of a response. A result of another kind than expected leaves the members for it as they are without one.
  explicit DecodedAnswer(const RpcFrame& response);

  // Valid until the next call, and as long as this object.
  const twr_answer& as(AnswerKind kind);

 private:
  void take(const Value& error);

  twr_answer answer_{};
  std::string errorDomain_;
  std::string errorMessage_;
  std::optional<Value> value_;
  std::string result_;
  std::vector<std::int64_t> reporterIDs_;
};

// One call of a caller's function that is to be made once no lock is held.
struct Delivery {
  PendingReply reply;
  std::shared_ptr<DecodedAnswer> answer;
  std::optional<twr_state> state;  // instead of an answer: the client's new state
};

using Deliveries = std::vector<Delivery>;

}  // namespace tonewerk
