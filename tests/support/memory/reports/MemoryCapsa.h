// SPDX-License-Identifier: Apache-2.0
#pragma once

#include <cstddef>
#include <memory>
#include <optional>
#include <string>
#include <vector>

#include "platform/FaultsignReporter.h"

namespace tonewerk {

// Records the captures that were asked for, and answers when the test says so.
//
//   capsa.answer(0, MemoryCapsa::started("S1"));   // the first request's handler is called here
//   EXPECT_THAT(capsa.cancelled(), ElementsAre("S1"));
//
// At first it accepts all parameters and sends no answer. Any thread.
class MemoryCapsa final : public Capsa {
 public:
  using ReplyMap = std::optional<ValueMap>;
  struct Request {
    bool isImmediate = false;
    FaultsignSignature signature;
    double duration = 0.0;  // seconds
    std::optional<ValueMap> events;
    std::optional<ValueMap> payload;
    std::optional<ValueMap> actions;
    FaultsignReporter::Reply reply;
  };

  MemoryCapsa();
  ~MemoryCapsa() override;

  [[nodiscard]] std::unique_ptr<FaultsignReporter> makeReporter() override;

  // From now on it does not accept parameters.
  void refuse();
  // From now on it answers every request with this before the call returns.
  void answerAtOnce(ReplyMap reply);
  // Answers the request with index `at` on the calling thread.
  void answer(std::size_t at, const ReplyMap& reply);

  static ReplyMap started(const std::string& sessionIdentifier);
  static ReplyMap failed(FaultsignError reason);

  // Returns all requests, also refused ones.
  std::vector<Request> requests() const;
  std::vector<std::string> cancelled() const;
  std::size_t reporterCount() const;

 private:
  struct State;
  class MemoryReporter;

  const std::shared_ptr<State> state_;  // shared with the reporters
};

}  // namespace tonewerk
