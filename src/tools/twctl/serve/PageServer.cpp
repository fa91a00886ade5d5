// SPDX-License-Identifier: Apache-2.0
#include "tools/twctl/serve/PageServer.h"

#include <chrono>
#include <memory>
#include <optional>
#include <utility>

#include "tools/twctl/report/ReportPage.h"
#include "values/CompactJson.h"
#include "values/Value.h"

namespace tonewerk {
namespace {

constexpr unsigned int kNotFound = 404;
// For what is no page.
constexpr const char* kNoContent =
    "default-src 'none'; base-uri 'none'; form-action 'none'; frame-ancestors 'none'";

PageAnswer refused(unsigned int status, std::string sentence) {
  PageAnswer answer;
  answer.status = status;
  answer.policy = kNoContent;
  answer.whole = std::make_shared<const std::string>(std::move(sentence) + "\n");
  return answer;
}

// The numbers of readings let the page know what it has.
ValueMap dataOf(const StoredReport::Reading& reading) {
  ValueMap data = reading.data;
  data.set("live", ValueMap{{"stored", reading.number}});
  return data;
}

}  // namespace

PageAnswer PageServer::answer(const PageRequest& request) const {
  if (std::optional<Refusal> refusal = check_.problemWith(request))
    return refused(refusal->status, std::move(refusal->sentence));
  if (request.path == "/") return page();
  if (request.path == "/data") return data();
  if (request.path == "/live") return live();
  return refused(kNotFound, "There is no such page. Open the address that twctl serve has printed.");
}

PageAnswer PageServer::page() const {
  const std::string nonce = newNonce();
  PageAnswer answer;
  answer.type = "text/html; charset=utf-8";
  answer.policy = "default-src 'none'; script-src 'nonce-" + nonce +
                  "'; style-src 'unsafe-inline'; connect-src 'self'; base-uri 'none'; form-action 'none'; "
                  "frame-ancestors 'none'";
  answer.whole = std::make_shared<const std::string>(
      reportPage(dataOf(*stored_.newest()), nonce, PageConnections::kOwnServer));
  stored_.refresh();
  return answer;
}

PageAnswer PageServer::data() const {
  std::string json;
  appendCompactJson(json, dataOf(*stored_.newest()));
  PageAnswer answer;
  answer.type = "application/json";
  answer.policy = kNoContent;
  answer.whole = std::make_shared<const std::string>(std::move(json));
  return answer;
}

// The reader's place is in the stream. An event has one line, because JSON without white space has no line
// ends.
PageAnswer PageServer::live() const {
  struct Stream {
    explicit Stream(LiveFeed& feed) : reader(feed) {}
    LiveFeed::Reader reader;
    std::uint64_t number = 0;
    bool hasBegun = false;
  };
  PageAnswer answer;
  answer.type = "text/event-stream";
  answer.policy = kNoContent;
  answer.parts = [&feed = feed_, &now = now_, stream = std::make_shared<Stream>(feed_)]() -> std::string {
    // The head of the answer goes out with its first part.
    if (!std::exchange(stream->hasBegun, true)) return "retry: 1000\n\n";
    const auto state = feed.newerThan(stream->number, std::chrono::seconds(kHeartbeatSeconds));
    if (feed.hasEnded()) return {};
    if (state == nullptr) return ":\n\n";
    return "data: {\"now\":" + std::to_string(now()) + "," + state->substr(1) + "\n\n";
  };
  return answer;
}

}  // namespace tonewerk
