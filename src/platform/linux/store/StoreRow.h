// SPDX-License-Identifier: Apache-2.0
#pragma once

#include <cstddef>
#include <cstdint>
#include <memory>
#include <string>
#include <variant>

#include "platform/Metricon.h"
#include "values/Value.h"

namespace tonewerk {

// An analytics event: one payload under one or two names.
struct AnalyticsRow {
  double recordedAt = 0.0;  // seconds since 1970
  EventNames names;
  ValueMap payload;

  std::size_t bytes() const { return sizeof(AnalyticsRow) + payload.bytes(); }
};

// A posted metric record.
struct MetricRow {
  double postedAt = 0.0;  // seconds since 1970
  std::uint32_t identifier = 0;
  std::string record;  // bytes

  std::size_t bytes() const { return sizeof(MetricRow) + record.size(); }
};

// An event of the power log.
struct PowerRow {
  double recordedAt = 0.0;  // seconds since 1970
  std::int64_t group = 0;
  SharedString name;
  ValueMap payload;

  std::size_t bytes() const { return sizeof(PowerRow) + payload.bytes(); }
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

  std::size_t bytes() const {
    return sizeof(RtcSessionRecord) + session->sessionInfo.bytes() + session->userInfo.bytes();
  }
};

// One message of such a session.
struct RtcMessageRow {
  double sentAt = 0.0;  // seconds since 1970
  std::shared_ptr<RtcSessionRecord> session;
  std::uint16_t category = 0;
  std::uint16_t type = 0;
  ValueMap payload;

  std::size_t bytes() const { return sizeof(RtcMessageRow) + payload.bytes(); }
};

// A row of one of the store's tables.
using StoreRow = std::variant<AnalyticsRow, MetricRow, PowerRow, RtcSessionRow, RtcMessageRow>;

inline std::size_t bytesOf(const StoreRow& row) {
  return std::visit([](const auto& held) { return held.bytes(); }, row);
}

}  // namespace tonewerk
