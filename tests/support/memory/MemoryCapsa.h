// SPDX-License-Identifier: Apache-2.0
#pragma once

#include <cstddef>
#include <memory>
#include <optional>
#include <string>
#include <vector>

#include "platform/FaultsignReporter.h"

namespace tonewerk {

// Keeps the captures that were asked for, and answers when the test says so.
//
//   capsa.answer(0, MemoryCapsa::started("S1"));   // the first request's handler is called here
//   EXPECT_THAT(capsa.cancelled(), ElementsAre("S1"));
//
// At the beginning parameters are accepted and no answer comes. Any thread.
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

  // From now on parameters are not accepted.
  void refuse();
  // From now on every request is answered with this before it returns.
  void answerAtOnce(ReplyMap reply);
  // Answers request number `at` on the calling thread.
  void answer(std::size_t at, const ReplyMap& reply);

  static ReplyMap started(const std::string& sessionIdentifier);
  static ReplyMap failed(FaultsignError reason);

  // Refused ones included.
  std::vector<Request> requests() const;
  std::vector<std::string> cancelled() const;
  std::size_t reporterCount() const;

 private:
  struct State;
  class MemoryReporter;

  const std::shared_ptr<State> state_;  // shared with the reporters
};

}  // namespace tonewerk
