// SPDX-License-Identifier: Apache-2.0
#pragma once

#include <string>
#include <vector>

#include "driver/TWReportingDriverUtility.h"
#include "support/ChannelRecords.h"
#include "support/ReportingTest.h"

namespace tonewerk {

// Base of the sampler's tests: gives access to the channels that a test sets and to the messages that a
// session got.
class DriverTest : public ReportingTest {
 protected:
  using Operation = MemoryChanmeter::Operation;
  using Group = MemoryChanmeter::Group;

  // A message that was sent to a session, without the entries that the session adds to every message.
  struct Sent {
    AudioEventCategory category;
    AudioEventType type;
    ValueMap payload;
    friend bool operator==(const Sent&, const Sent&) = default;
    friend void PrintTo(const Sent& sent, std::ostream* out) {
      *out << sent.category << "/" << sent.type << " " << sent.payload.text();
    }
  };

  static std::vector<Sent> sentTo(const TWReportingSession& session) {
    std::vector<Sent> sent;
    for (const auto& record : session.messages()) {
      ValueMap payload = record->message;
      for (const char* added :
           {"twreporting_timestamp", "invalid_timestamp", "audiotag", "HostApplicationDisplayID"}) {
        payload.erase(added);
      }
      sent.push_back({record->category, record->type, payload});
    }
    return sent;
  }

  std::vector<std::string> logged(LogLevel level) const { return test.log.textsOf("twrd", level); }

  static constexpr AudioEventCategory kChanmetering = 12;
  MemoryChanmeter& chanmeter = test.chanmeter;
};

}  // namespace tonewerk
