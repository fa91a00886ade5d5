// SPDX-License-Identifier: Apache-2.0
#pragma once

#include <nlohmann/json.hpp>
#include <optional>
#include <string>
#include <vector>

namespace tonewerk {

// What anybody can read out of the daemon's store, also while the daemon writes.
class RecordedEvents {
 public:
  explicit RecordedEvents(std::string path) : path_(std::move(path)) {}

  // The payloads of all events of this name, oldest first; none without a readable store.
  std::vector<nlohmann::json> named(const std::string& name) const;
  // The names of all events, oldest first.
  std::vector<std::string> names() const;
  // What the sessions told the local backend of themselves, and the payloads of what they sent to it, oldest
  // first.
  std::vector<nlohmann::json> rtcSessions() const;
  std::vector<nlohmann::json> rtcMessages() const;
  // What the database itself finds wrong with it; "ok" when nothing is.
  std::string integrity() const;

 private:
  // The first column of all rows.
  std::vector<std::string> texts(const std::string& query,
                                 const std::optional<std::string>& argument = {}) const;

  const std::string path_;
};

}  // namespace tonewerk
