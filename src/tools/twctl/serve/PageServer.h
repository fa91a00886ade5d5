// SPDX-License-Identifier: Apache-2.0
#pragma once

#include <cstdint>
#include <string>

#include "tools/twctl/serve/HttpServer.h"
#include "tools/twctl/serve/LiveFeed.h"
#include "tools/twctl/serve/RequestCheck.h"
#include "tools/twctl/serve/StoredReport.h"

namespace tonewerk {

// Answers the requests of the live page. Any thread.
//
//   /      the page, with the stored data
//   /data  the stored data, as JSON
//   /live  what runs, as server-sent events: each is the newest state, as JSON
class PageServer {
 public:
  // An event stream without news says so little so often, and then finds out that its reader has gone.
  static constexpr int kHeartbeatSeconds = 5;

  // All outlive it.
  PageServer(const RequestCheck& check, StoredReport& stored, LiveFeed& feed)
      : check_(check), stored_(stored), feed_(feed) {}

  [[nodiscard]] PageAnswer answer(const PageRequest& request) const;

 private:
  [[nodiscard]] PageAnswer page() const;
  [[nodiscard]] PageAnswer data() const;
  [[nodiscard]] PageAnswer live() const;

  const RequestCheck& check_;
  StoredReport& stored_;
  LiveFeed& feed_;
};

}  // namespace tonewerk
