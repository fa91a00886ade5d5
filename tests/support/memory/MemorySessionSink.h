// SPDX-License-Identifier: Apache-2.0
#pragma once

#include <cstdint>
#include <map>
#include <string>
#include <vector>

#include "bridges/pipewire/sessions/SessionSink.h"
#include "values/Value.h"

namespace tonewerk {

// Records the sessions that a reporting daemon would get.
class MemorySessionSink final : public SessionSink {
 public:
  struct Message {
    std::uint32_t category;
    std::uint16_t type;
    ValueMap payload;
  };
  struct Session {
    std::int64_t reporterID = 0;
    std::uint16_t serviceType = 0;
    ValueMap configuration;
    std::vector<std::string> calls;  // the names of all calls, "message" included, in order
    std::vector<Message> messages;
  };

  // In the order of creation.
  std::vector<Session> sessions;

  const Session& only() const { return sessions.at(0); }

  void create(std::int64_t reporterID) override {
    sessions.push_back({});
    sessions.back().reporterID = reporterID;
    call(reporterID, "create");
  }
  void configure(std::int64_t reporterID, std::uint16_t serviceType, const ValueMap& configuration) override {
    Session& session = call(reporterID, "configure");
    session.serviceType = serviceType;
    session.configuration = configuration;
  }
  void start(std::int64_t reporterID) override { call(reporterID, "start"); }
  void message(std::int64_t reporterID, std::uint32_t category, std::uint16_t type,
               ValueMap message) override {
    call(reporterID, "message").messages.push_back({category, type, std::move(message)});
  }
  void stop(std::int64_t reporterID) override { call(reporterID, "stop"); }
  void destroy(std::int64_t reporterID) override { call(reporterID, "destroy"); }

 private:
  Session& call(std::int64_t reporterID, const char* name) {
    for (Session& session : sessions) {
      if (session.reporterID != reporterID) continue;
      session.calls.emplace_back(name);
      return session;
    }
    // Records a call for a session that nobody created, so that expectations on `sessions` fail.
    sessions.push_back({});
    sessions.back().calls.emplace_back(std::string(name) + " without create");
    return sessions.back();
  }
};

}  // namespace tonewerk
