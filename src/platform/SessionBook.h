// SPDX-License-Identifier: Apache-2.0
#pragma once

#include <cstdint>
#include <memory>
#include <optional>
#include <string_view>
#include <utility>

#include "values/SharedString.h"

namespace tonewerk {

// What is known of a session's life when it begins. A session that starts again after a stop has a new life.
struct SessionBeginning {
  std::int64_t reporterID = 0;
  double at = 0.0;  // seconds since 1970
  // The number in the journal of the request with which it began. With the reporter's identifier it is how a
  // life is known again when the journal is played. 0 when no journal is kept.
  std::uint64_t request = 0;
  SharedString service;  // "telephony"
};

// A life of a session. What is recorded of it shares this, because each record needs its identifier.
struct SessionLife {
  explicit SessionLife(SessionBeginning what) : beginning(std::move(what)) {}

  const SessionBeginning beginning;

  // Where the book keeps it: the entry's identifier, and in which of the files that it wrote. Only the book
  // uses this.
  struct Place {
    std::int64_t identifier = 0;
    std::uint64_t file = 0;
  };
  Place place;
};

enum class SessionEnding {
  kStopped,       // by its client, or for want of use
  kReplaced,      // by another session of its client under the same identifier
  kDisconnected,  // its client has gone
  kInterrupted,   // the daemon has gone
};

// Returns "stopped", "replaced", "disconnected" or "interrupted".
std::string_view textOf(SessionEnding ending);

struct SessionEnd {
  double at = 0.0;  // seconds since 1970
  SessionEnding ending = SessionEnding::kStopped;
  std::uint64_t messages = 0;           // received, those that the stop derives not included
  std::uint64_t redundantMessages = 0;  // those of them that repeated another one
  double activeSeconds = 0.0;
  std::uint64_t overloads = 0;
};

// Keeps the lives of sessions: who they belonged to, and how they ended. Any thread.
class SessionBook {
 public:
  virtual ~SessionBook() = default;

  // Enters a life that has begun, or what it has become. Entering it again, also after a crash, changes its
  // entry. An empty name is not known. May wait while the recorder's queue is full.
  virtual void enter(const std::shared_ptr<SessionLife>& life, const SharedString& application,
                     const SharedString& process, const std::optional<SessionEnd>& end) = 0;
};

}  // namespace tonewerk
