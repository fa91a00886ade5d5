// SPDX-License-Identifier: Apache-2.0
#include "platform/linux/store/StoreNumbering.h"

#include <algorithm>
#include <cstddef>
#include <optional>

namespace tonewerk {

bool StoreNumbering::readNewest() {
  newestInTable_ = database_.prepare("SELECT coalesce(max(id), 0) FROM analytics_row");
  const auto event = newestInTable_.firstNumber();
  if (!event) return false;
  const auto message = database_.number("SELECT coalesce(max(id), 0) FROM rtc_row");
  if (!message) return false;
  newestEvent_ = std::max(*event, floors_[storeTableIndex("analytics_row")]);
  newestMessage_ = std::max({newestEvent_, *message, floors_[storeTableIndex("rtc_row")]});
  hasRead_ = true;
  return true;
}

bool StoreNumbering::number(const StoreBatch& batch) {
  analytics_.clear();
  rtcMessages_.clear();
  if (!hasRead_ && !readNewest()) return false;
  // Another program may have written, although it should not.
  const std::optional<std::int64_t> inTable = newestInTable_.firstNumber();
  if (!inTable) return false;
  newestEvent_ = std::max(newestEvent_, *inTable);
  const auto messages = batch.rtcMessages();
  const auto numberMessagesBefore = [&](std::size_t event) {
    while (rtcMessages_.size() < messages.size() && messages[rtcMessages_.size()].eventsBefore <= event) {
      rtcMessages_.push_back(++newestMessage_);
    }
  };
  for (const StoreBatch::Analytics& row : batch.analytics()) {
    numberMessagesBefore(analytics_.size());
    if (row.rtc) newestEvent_ = newestMessage_ = std::max(newestEvent_, newestMessage_) + 1;
    analytics_.push_back(row.rtc ? newestEvent_ : ++newestEvent_);
  }
  numberMessagesBefore(analytics_.size());
  analyticsAreNext_ = newestEvent_ == *inTable + static_cast<std::int64_t>(analytics_.size());
  return true;
}

}  // namespace tonewerk
