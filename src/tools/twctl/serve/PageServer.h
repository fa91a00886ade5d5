// SPDX-License-Identifier: Apache-2.0
#pragma once

#include <cstdint>
#include <functional>
#include <string>
#include <utility>

#include "tools/twctl/serve/HttpServer.h"
#include "tools/twctl/serve/LiveFeed.h"
#include "tools/twctl/serve/RequestCheck.h"
#include "tools/twctl/serve/StoredReport.h"

namespace tonewerk {

// Answers the requests of the live page. Any thread.
//
//   /      the page, with the stored data
//   /data  the stored data, as JSON
//   /live  what runs, as server-sent events: each is the newest state, as JSON, with the time in front:
//          {"now":1700000000.000000,"changed":...}
class PageServer {
 public:
  // An event stream without news says so little so often, and then finds out that its reader has gone.
  static constexpr int kHeartbeatSeconds = 5;

  // All outlive it. `now` returns the time in seconds since 1970 on any thread. A page that opens long after
  // the last change needs it.
  PageServer(const RequestCheck& check, StoredReport& stored, LiveFeed& feed, std::function<double()> now)
      : check_(check), stored_(stored), feed_(feed), now_(std::move(now)) {}

  [[nodiscard]] PageAnswer answer(const PageRequest& request) const;

 private:
  [[nodiscard]] PageAnswer page() const;
  [[nodiscard]] PageAnswer data() const;
  [[nodiscard]] PageAnswer live() const;

  const RequestCheck& check_;
  StoredReport& stored_;
  LiveFeed& feed_;
  const std::function<double()> now_;
};

}  // namespace tonewerk
