// SPDX-License-Identifier: Apache-2.0
#pragma once

#include <cstddef>
#include <cstdint>
#include <memory>
#include <optional>
#include <string>
#include <vector>

#include "platform/LinkReport.h"

namespace tonewerk {

// Records what real-time-communication sessions were made with and sent, and answers with backends when the
// test says so.
//
//   linkReport.answerLater();
//   ...
//   linkReport.answer(0, {{"fleet"}});        // the first session's handler is called here
//   EXPECT_THAT(linkReport.session(0).messages, SizeIs(2));
//
// Any thread.
class MemoryLinkReport final : public LinkReport {
 public:
  struct Message {
    std::uint16_t category;
    std::uint16_t type;
    ValueMap payload;
  };
  struct Session {
    ValueMap sessionInfo;
    ValueMap userInfo;
    std::vector<Message> messages;
    std::size_t flushCount = 0;
    bool isOpen = true;
    LinkReportSession::CompletionHandler handler;  // null until the session asks for backends
  };

  MemoryLinkReport();
  ~MemoryLinkReport() override;

  [[nodiscard]] std::optional<std::string> newHierarchyTokenFromParentToken(
      const std::optional<std::string>& parentToken) override;
  [[nodiscard]] std::unique_ptr<LinkReportSession> initWithSessionInfo(
      const ValueMap& sessionInfo, const ValueMap& userInfo, const ValueArray* frameworksToCheck) override;

  // From now on sessions say that sending takes long, or not. At first it does not.
  void setQuick(bool isQuick);

  // From now on sessions get these backends as soon as they ask; at first {"memory"}.
  void answerAtOnce(LinkReportSession::Backends backends);
  // From now on sessions get an answer only from answer().
  void answerLater();
  // Calls the handler of the session with index `at`, in the order of creation.
  void answer(std::size_t at, LinkReportSession::Backends backends);

  void giveNoTokens();
  // From now on sending fails with this problem.
  void failSending(std::string problem);

  // Returns the number of sessions made so far, also of ended ones.
  std::size_t count() const;
  Session session(std::size_t at) const;

 private:
  struct State;
  class MemorySession;

  const std::shared_ptr<State> state_;  // shared with the sessions
};

}  // namespace tonewerk
