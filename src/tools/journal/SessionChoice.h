// SPDX-License-Identifier: Apache-2.0
#pragma once

#include <cstdint>
#include <map>
#include <optional>
#include <utility>

#include "platform/Journal.h"
#include "protocol/AudioEvent.h"
#include "protocol/RequestSet.h"

namespace tonewerk {

// Chooses the requests of some sessions among those of all clients. It follows which sessions there are, as
// the service does: what a client asks for a session reaches its own one, a message also those of others.
class SessionChoice {
 public:
  // What sessions must have; without anything, all requests are chosen.
  struct Wanted {
    std::optional<ReporterID> session;
    std::optional<double> since;  // created from then on, in seconds since 1970
    std::optional<double> until;
  };

  // `daemonUser`: the user of the daemon, who reaches the sessions of all users, as root does.
  SessionChoice(const Wanted& wanted, std::uint32_t daemonUser) : wanted_(wanted), daemonUser_(daemonUser) {}

  // Takes the next request, which has no problem, and returns whether it is chosen.
  [[nodiscard]] bool takes(const Journal::Origin& origin, const Method& method, const Arguments& arguments);
  // The client and its sessions are gone.
  void disconnect(std::uint64_t client);
  // All clients are gone.
  void disconnectAll() { sessions_.clear(); }

  // Whether messages without a session are never chosen.
  bool isOfOneSession() const { return wanted_.session.has_value(); }
  // How many sessions were chosen so far.
  std::uint64_t sessions() const { return chosen_; }

 private:
  struct Session {
    std::uint32_t user = 0;
    std::int64_t serviceType = 0;
    bool isChosen = false;
    bool isStarted = false;
  };

  bool takesAll() const { return !wanted_.session && !wanted_.since && !wanted_.until; }
  bool isWithin(double time) const;
  bool takesMessage(const Journal::Origin& origin, const Argument& sessions) const;
  bool takesCall(const Journal::Origin& origin, const Method& method, const Arguments& arguments);

  const Wanted wanted_;
  const std::uint32_t daemonUser_;
  std::map<std::pair<std::uint64_t, ReporterID>, Session> sessions_;  // by client
  std::uint64_t chosen_ = 0;
};

}  // namespace tonewerk
