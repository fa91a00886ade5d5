// SPDX-License-Identifier: Apache-2.0
#pragma once

#include <algorithm>
#include <cstddef>
#include <map>
#include <utility>
#include <vector>

#include "protocol/AudioEvent.h"
#include "values/Prefetch.h"

namespace tonewerk {

class TWReportingSessionMessage;

// Finds the newest stored message of each category and type of a session.
//
// Few kinds, which is what nearly all sessions have, lie next to each other, so that finding one among many
// sessions waits for memory once. Further kinds are in an ordered map, because clients choose them and could
// choose ones that collide in a hash table. Holds the messages without owning them. One thread.
class NewestMessages {
 public:
  static constexpr std::size_t kFew = 32;
  // An upper bound of the bytes that a kind takes.
  static constexpr std::size_t kKindBytes = 96;

  using Kind = std::pair<AudioEventCategory, AudioEventType>;
  using Message = const TWReportingSessionMessage*;

  // Null for a kind that has none.
  Message find(Kind kind) const {
    for (const auto& [held, message] : few_) {
      if (held == kind) return message;
    }
    const auto found = others_.find(kind);
    return found == others_.end() ? nullptr : found->second;
  }
  void set(Kind kind, Message message) {
    const auto held =
        std::find_if(few_.begin(), few_.end(), [&](const auto& entry) { return entry.first == kind; });
    if (held != few_.end()) {
      held->second = message;
    } else if (few_.size() < kFew) {
      few_.emplace_back(kind, message);
    } else {
      others_[kind] = message;
    }
  }
  void clear() {
    few_ = {};
    others_.clear();
  }

  // Asks the processor for the memory that find() reads.
  void prefetchKinds() const {
    for (std::size_t at = 0; at < few_.size(); at += 4) prefetch(&few_[at]);
  }

 private:
  std::vector<std::pair<Kind, Message>> few_;
  std::map<Kind, Message> others_;
};

}  // namespace tonewerk
