// SPDX-License-Identifier: Apache-2.0
#pragma once

#include <cstddef>
#include <cstdint>
#include <optional>
#include <string>
#include <vector>

#include "tools/twctl/sessions/SessionReasons.h"
#include "tools/twctl/sessions/SessionRecords.h"
#include "tools/twctl/sessions/StoredSessions.h"

namespace tonewerk {

// Tells in words what happened in a session, and why. The texts end with a line feed, and have what clients
// have sent: they are not safe for a terminal yet.
class SessionStory {
 public:
  // `life`: null when the journal does not have the session; `whyNot` then says why. No line is longer than
  // `width` characters, unless a single word is; none for any length. All outlive the object.
  SessionStory(const StoredSession& session, const SessionRecords& records, const ReasonedLife* life,
               std::string whyNot, std::optional<std::size_t> width)
      : session_(session), records_(records), life_(life), whyNot_(std::move(whyNot)), width_(width) {}

  // Everything.
  std::string whole() const;
  // What one message was, and whether it repeated another one; empty when there is no such message.
  std::string message(std::int64_t number) const;
  // Which stretches there were for summaries of a category ("Volume", "Input" or "Gather"), and why each has
  // a summary or none.
  std::string summaries(const std::string& category) const;
  // What made an event of the session.
  std::string event(const StoredEventRow& event) const;

 private:
  void head(std::string& text) const;
  void messages(std::string& text, bool areDerived) const;
  void withheldOrMade(std::string& text, const ReasonedLife::Walk& walk) const;
  void step(std::string& text, const ReasonedLife::Walk& walk, const ValueMap& step) const;
  void knownToTheStore(std::string& text) const;
  void issues(std::string& text) const;
  void unknownReasons(std::string& text) const;
  std::string messageLine(const ValueMap& message) const;
  std::string repeatedBy(std::int64_t number) const;
  std::string causeOf(const ReasonedLife::Walk& walk, const ValueMap& end) const;
  std::string outcomeOf(const ReasonedLife::Walk& walk, const ValueMap& end) const;
  // "+2.5 s", since the session began.
  std::string since(double time) const;
  // Adds a paragraph whose later lines begin with so many spaces.
  void add(std::string& text, const std::string& paragraph, std::size_t indent = 0) const;

  const StoredSession& session_;
  const SessionRecords& records_;
  const ReasonedLife* const life_;
  const std::string whyNot_;
  const std::optional<std::size_t> width_;
};

}  // namespace tonewerk
