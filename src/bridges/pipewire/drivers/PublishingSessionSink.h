// SPDX-License-Identifier: Apache-2.0
#pragma once

#include "bridges/pipewire/drivers/ChannelPublisher.h"
#include "bridges/pipewire/sessions/SessionSink.h"

namespace tonewerk {

// Passes calls to another sink, and brings the published channels up to date before a session is made and
// before it stops. The daemon subscribes to the channels when its first session starts, reads them at each
// start and stop, and reports the difference.
class PublishingSessionSink final : public SessionSink {
 public:
  // Both outlive this object.
  PublishingSessionSink(SessionSink& next, ChannelPublisher& publisher)
      : next_(next), publisher_(publisher) {}

  void create(std::int64_t reporterID) override {
    publisher_.publish();
    next_.create(reporterID);
  }
  void configure(std::int64_t reporterID, std::uint16_t serviceType, const ValueMap& configuration) override {
    next_.configure(reporterID, serviceType, configuration);
  }
  void start(std::int64_t reporterID) override { next_.start(reporterID); }
  void message(std::int64_t reporterID, std::uint32_t category, std::uint16_t type,
               ValueMap message) override {
    next_.message(reporterID, category, type, std::move(message));
  }
  void stop(std::int64_t reporterID) override {
    publisher_.publish();
    next_.stop(reporterID);
  }
  void destroy(std::int64_t reporterID) override { next_.destroy(reporterID); }

 private:
  SessionSink& next_;
  ChannelPublisher& publisher_;
};

}  // namespace tonewerk
