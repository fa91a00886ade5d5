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

// Holds an answer of the C interface and the memory that it points into.
class DecodedAnswer {
 public:
  explicit DecodedAnswer(twr_status status);
  // Reads a response. A result of an unexpected kind counts as none.
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

// A call of a caller's function that is to be made once no lock is held.
struct Delivery {
  PendingReply reply;
  std::shared_ptr<DecodedAnswer> answer;
  std::optional<twr_state> state;  // the client's new state, instead of an answer
};

using Deliveries = std::vector<Delivery>;

}  // namespace tonewerk
