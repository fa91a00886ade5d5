// SPDX-License-Identifier: Apache-2.0
#pragma once

#include <cstddef>
#include <cstdint>
#include <memory>
#include <optional>
#include <string>
#include <string_view>
#include <utility>

#include "platform/Metricon.h"
#include "platform/SessionBook.h"
#include "values/Value.h"

namespace tonewerk {

// Costs little: the names know their hashes.
struct EventNamesHash {
  std::size_t operator()(const EventNames& names) const {
    return names.first.hash() * 31 + names.second.hash();
  }
};

// What the names of an event say. Of a message it says a little more: its category and type make the names,
// but cannot be read from them.
struct EventKind {
  EventKind() = default;
  EventKind(EventNames itsNames, const EventSubject& subject)
      : names(std::move(itsNames)), category(subject.category), type(subject.type), source(subject.source) {}

  friend bool operator==(const EventKind&, const EventKind&) = default;

  EventNames names;
  AudioEventCategory category = kCategoryUnknown;
  AudioEventType type = kTypeUnknown;
  EventSource source = EventSource::kUnknown;
};

struct EventKindHash {
  std::size_t operator()(const EventKind& kind) const {
    return EventNamesHash{}(kind.names) * 31 + static_cast<std::size_t>(kind.source);
  }
};

// What is recorded, one type for each of the store's tables.

// An analytics event: one payload under one or two names.
struct AnalyticsRow {
  double recordedAt = 0.0;  // seconds since 1970
  EventNames names;
  ValueMap payload;
  EventSubject subject = {};
};

// A life of a session, or what it has become.
struct LifeRow {
  std::shared_ptr<SessionLife> life;
  SharedString application;  // empty when it is not known
  SharedString process;      // empty when it is not known
  std::optional<SessionEnd> end = {};
};

// A posted metric record.
struct MetricRow {
  double postedAt = 0.0;  // seconds since 1970
  std::uint32_t identifier = 0;
  std::string record;  // bytes
};

// An event of the power log.
struct PowerRow {
  double recordedAt = 0.0;  // seconds since 1970
  std::int64_t group = 0;
  SharedString name;
  ValueMap payload;
};

// A real-time-communication session. The rows of its messages share it, because each needs its identifier.
struct RtcSessionRecord {
  double startedAt = 0.0;  // seconds since 1970
  ValueMap sessionInfo;
  ValueMap userInfo;

  // Where the store keeps it: the row's identifier, and in which of the files that it wrote. Only the writer
  // uses this.
  struct Place {
    std::int64_t identifier = 0;
    std::uint64_t file = 0;
  };
  Place place;
};

struct RtcSessionRow {
  std::shared_ptr<RtcSessionRecord> session;
};

// One message of such a session.
struct RtcMessageRow {
  double sentAt = 0.0;  // seconds since 1970
  std::shared_ptr<RtcSessionRecord> session;
  std::uint16_t category = 0;
  std::uint16_t type = 0;
  ValueMap payload;
  std::string_view hidden = {};  // the store does not take this entry of the payload; empty for none
};

// What does not vary in size of a SendingRow.
struct SendingFacts {
  enum class Outcome {
    kDelivered,  // accepted; `rejected` says of how many records that is not true
    kKept,       // the same records are sent again later
    kSplit,      // too large: they are sent again in halves
    kDropped,    // refused for ever
  };

  double sentAt = 0.0;             // seconds since 1970
  std::string_view signal;         // "logs" or "metrics"; a literal
  std::uint64_t records = 0;       // in the request
  std::uint64_t bytes = 0;         // of its body, as it was sent
  std::optional<int> status = {};  // of HTTP; none without an answer
  Outcome outcome = Outcome::kDelivered;
  // How many of the records it did not take, as its answer says; none unless it accepted the request.
  std::optional<std::uint64_t> rejected = {};
};

// One request that was sent to an endpoint in the network.
struct SendingRow {
  SendingFacts facts;
  std::string endpoint;  // its address, without user, password and query
  std::string problem;   // why there is no answer, or what is wrong with it; empty when nothing is
};

}  // namespace tonewerk
