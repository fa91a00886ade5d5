// SPDX-License-Identifier: Apache-2.0
#pragma once

#include <cstdint>
#include <functional>
#include <memory>
#include <optional>
#include <string>
#include <string_view>
#include <vector>

#include "values/Value.h"

namespace tonewerk {

// Keys of a session's two maps. The text of each key is the name of its constant.
inline const SharedString kLinkReportSessionInfoClientType("kLinkReportSessionInfoClientType");
inline const SharedString kLinkReportSessionInfoClientVersion("kLinkReportSessionInfoClientVersion");
inline const SharedString kLinkReportSessionInfoSessionID("kLinkReportSessionInfoSessionID");
inline const SharedString kLinkReportSessionInfoBatchEvent("kLinkReportSessionInfoBatchEvent");
inline const SharedString kLinkReportSessionInfoHierarchyToken("kLinkReportSessionInfoHierarchyToken");
inline const SharedString kLinkReportSessionInfoContainsRealtimeEvents(
    "kLinkReportSessionInfoContainsRealtimeEvents");
inline const SharedString kLinkReportSessionInfoClientBundleID("kLinkReportSessionInfoClientBundleID");
inline const SharedString kLinkReportUserInfoClientName("kLinkReportUserInfoClientName");
inline const SharedString kLinkReportUserInfoServiceName("kLinkReportUserInfoServiceName");

// Reports one session to the real-time-communication reporting service:
//
//   initWithSessionInfo() -> startConfiguration...() -> [backends] -> sendMessage...()... -> flushMessages()
//
// Use it on one thread at a time; different sessions may be on different threads. No call waits for a
// network. Destroying it ends the session; its handler
// may still be called after that.
class LinkReportSession {
 public:
  // The names of the backends that take this session's messages; none when there are no backends.
  using Backends = std::optional<std::vector<std::string>>;
  using CompletionHandler = std::function<void(Backends backends)>;

  virtual ~LinkReportSession() = default;

  // Asks for the backends. `handler` is called at most once, before or after this returns, on any thread.
  virtual void startConfigurationWithCompletionHandler(CompletionHandler handler) = 0;

  // The entries of a message, without one of them.
  struct Payload {
    const ValueMap& entries;
    std::string_view hidden = {};  // this key is not sent; empty for none
  };

  // Passes the message to every backend; each delivers it later. Returns false when a backend could not take
  // it; `problem` then says why, or is empty. May wait while the report store's queue is full.
  [[nodiscard]] virtual bool sendMessageWithCategory(std::uint16_t category, std::uint16_t type,
                                                     const Payload& payload, std::string& problem) = 0;

  // Sends the messages now instead of in a batch. Does not wait for it.
  virtual void flushMessages() = 0;

  // Whether sending a message takes about as long as handing it to another thread. Asked after the backends
  // have answered.
  virtual bool isQuick() const = 0;

  // For the log.
  virtual std::string description() const = 0;
};

// The real-time-communication reporting service. Any thread. It outlives its sessions.
class LinkReport {
 public:
  virtual ~LinkReport() = default;

  // Returns a token that places a session below another one in a tree of sessions, or at the root when there
  // is no parent. Returns none when the service has no token.
  [[nodiscard]] virtual std::optional<std::string> newHierarchyTokenFromParentToken(
      const std::optional<std::string>& parentToken) = 0;

  // Never returns null. `frameworksToCheck` may be null.
  [[nodiscard]] virtual std::unique_ptr<LinkReportSession> initWithSessionInfo(
      const ValueMap& sessionInfo, const ValueMap& userInfo, const ValueArray* frameworksToCheck) = 0;
};

}  // namespace tonewerk
