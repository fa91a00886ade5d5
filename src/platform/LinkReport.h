// SPDX-License-Identifier: Apache-2.0
#pragma once

#include <cstdint>
#include <functional>
#include <memory>
#include <optional>
#include <string>
#include <vector>

#include "values/Value.h"

namespace tonewerk {

// Keys of a service session's two maps. A key's text is the constant's name.
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

// One session of the real-time-communication reporting service:
//
//   initWithSessionInfo() -> startConfiguration...() -> [backends] -> sendMessage...()... -> flushMessages()
//
// One thread at a time. No call waits for a network. Destroying it ends the session; its handler may still be
// called after that.
class LinkReportSession {
 public:
  // The names of the backends that take this session's messages; none without any.
  using Backends = std::optional<std::vector<std::string>>;
  using CompletionHandler = std::function<void(Backends backends)>;

  virtual ~LinkReportSession() = default;

  // Asks for the backends. `handler` is called once or never, at once or later, on any thread.
  virtual void startConfigurationWithCompletionHandler(CompletionHandler handler) = 0;

  // Hands the message to every backend, which delivers it in its own time. False when one could not take it;
  // then `problem` says why, or is empty. May wait for the report store as any recording does.
  [[nodiscard]] virtual bool sendMessageWithCategory(std::uint16_t category, std::uint16_t type,
                                                     const ValueMap& payload, std::string& problem) = 0;

  // What was sent goes out now instead of in a batch. Does not wait for it.
  virtual void flushMessages() = 0;

  // For the log.
  virtual std::string description() const = 0;
};

// The real-time-communication reporting service. One thread at a time; outlives its sessions.
class LinkReport {
 public:
  virtual ~LinkReport() = default;

  // Places a session below another one in a tree of sessions, or at the root without a parent. None when the
  // service gives none.
  [[nodiscard]] virtual std::optional<std::string> newHierarchyTokenFromParentToken(
      const std::optional<std::string>& parentToken) = 0;

  // Never null. `frameworksToCheck` null for none.
  [[nodiscard]] virtual std::unique_ptr<LinkReportSession> initWithSessionInfo(
      const ValueMap& sessionInfo, const ValueMap& userInfo, const ValueArray* frameworksToCheck) = 0;
};

}  // namespace tonewerk
